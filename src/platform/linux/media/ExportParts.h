#pragma once

#include "base/Guarded.h"
#include "platform/linux/media/MovieExport.h"
#include "platform/linux/media/MovieMuxer.h"
#include "platform/linux/media/MovieReader.h"

#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace kelvo {

/// The movie that an export reads, and the part of it that is wanted.
struct ExportSource {
    std::unique_ptr<MovieReader> reader;
    MediaTimeRange range;

    /// Fails when the movie cannot be read or has nothing in the range.
    static Result<ExportSource> open(const ExportRequest& request);

    /// A time of a stream's timescale in seconds from the range's start.
    double secondsFromStart(std::int64_t time, int stream) const {
        return static_cast<double>(time) * av_q2d(reader->stream(stream).time_base) - range.start.seconds();
    }
};

/// The movie that an export makes. Thread-safe once it is created, except for `finish`.
class ExportFile {
  public:
    OptionalError create(const std::string& path, const std::vector<TrackFormat>& tracks);
    bool isCreated() const { return muxer_ != nullptr; }

    /// Adds a sample; see `MovieMuxer`. What goes wrong with it is told by `error`.
    void append(std::size_t track, const SampleTiming& timing, std::span<const std::byte> data) {
        muxer_->append(track, timing, data);
    }
    OptionalError error() const { return error_.copy(); }
    OptionalError finish(const MediaTime& end) { return muxer_->finish(end); }

  private:
    Guarded<OptionalError> error_;
    std::unique_ptr<MovieMuxer> muxer_;
};

/// Gives the source's packets to `take`, from the range's start on, until the source ends, `isDone` says so,
/// the export is cancelled, or something fails: reading, taking, or writing to `file`.
OptionalError forEachPacket(const ExportSource& source, const ExportControl& control, const ExportFile& file,
                            const std::function<bool()>& isDone,
                            const std::function<OptionalError(const AVPacket&)>& take);

}  // namespace kelvo
