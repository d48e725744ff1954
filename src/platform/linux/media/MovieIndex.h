#pragma once

#include "base/KVError.h"
#include "base/MediaTime.h"
#include "platform/linux/media/FragmentReader.h"
#include "platform/linux/media/MovieHeader.h"
#include "platform/linux/media/MovieTrack.h"

#include <cstdint>
#include <vector>

namespace kelvo {

/// Writes the index of a finished movie, from the fragments that its file holds. Reads the fragments' headers
/// once for each table, so that its memory does not grow with the movie. Caller's thread.
class MovieIndex {
  public:
    /// What lies at or after `end` (counted from the movie's beginning) is left out; invalid is no end.
    MovieIndex(FragmentReader& reader, const std::vector<TrackFormat>& tracks, const MediaTime& end);

    OptionalError write(BoxWriter& writer, std::int64_t creationTime);

  private:
    /// What one pass over the fragments tells about a track. Times include the track's lead.
    struct Summary {
        std::uint64_t samplesSeen = 0;
        std::uint64_t samplesKept = 0;  ///< those before the end, in decoding order
        std::int64_t firstDecodeTime = 0;
        std::int64_t lastDecodeTime = 0;
        std::int64_t presentationEnd = 0;
        bool hasCompositionOffsets = false;
        bool hasOtherThanKeyFrames = false;
    };

    void summarize(const FragmentReader::Run& run);
    void clipToEnd();
    TrackExtent extent(std::size_t track) const;
    void writeTrack(BoxWriter& writer, std::size_t track, std::int64_t creationTime);
    void writeEdits(BoxWriter& writer, std::size_t track);
    void writeTables(BoxWriter& writer, std::size_t track);
    void writeDecodeTimes(BoxWriter& writer, std::size_t track);
    void writeCompositionOffsets(BoxWriter& writer, std::size_t track);
    void writeKeyFrames(BoxWriter& writer, std::size_t track);
    void writeChunkLengths(BoxWriter& writer, std::size_t track);
    void writeSampleSizes(BoxWriter& writer, std::size_t track);
    void writeChunkOffsets(BoxWriter& writer, std::size_t track);

    /// Calls `visit(run, count)` for each run of `track` that has samples to keep: its first `count`.
    template <typename Visit>
    void forEachKeptRun(std::size_t track, Visit&& visit);
    /// Calls `visit(timing, size)` for each sample to keep, with its exact decode time.
    template <typename Visit>
    void forEachKeptSample(std::size_t track, Visit&& visit);

    FragmentReader& reader_;
    const std::vector<TrackFormat>& tracks_;
    std::vector<std::int64_t> ends_;  ///< in each track's timescale, lead included
    std::vector<Summary> summaries_;
    OptionalError error_;
};

}  // namespace kelvo
