#pragma once

#include "base/Result.h"
#include "platform/Asset.h"
#include "platform/linux/media/LavPointers.h"

#include <string>
#include <vector>

namespace kelvo {

/// An MPEG-4 movie file that is read packet by packet. Opening refuses what is no whole movie: anything but a
/// regular file, other formats, a file that was cut short, no video track, more than 32 tracks, absurd
/// durations. (A movie in
/// fragments that was never finished is whole up to its last fragment.) Caller's thread.
class MovieReader {
  public:
    static Result<std::unique_ptr<MovieReader>> open(const std::string& path);

    AVFormatContext& context() const { return *context_; }
    AVStream& stream(int index) const { return *context_->streams[index]; }
    /// The first video track.
    int videoStream() const;
    std::vector<int> audioStreams() const;

    MediaTime duration() const;
    std::vector<AssetTrack> tracks(MediaType type) const;

    /// The next packet in the file's order; none at the end. It stays valid until the next call.
    Result<AVPacket*> next();

    /// Goes to the last key frame at or before `seconds` and, for the other tracks, to about the same place.
    OptionalError seek(double seconds);

  private:
    explicit MovieReader(FormatContextPointer context);

    OptionalError check(std::int64_t fileSize) const;
    void findDurationOfFragments();

    const FormatContextPointer context_;
    const PacketPointer packet_;
};

}  // namespace kelvo
