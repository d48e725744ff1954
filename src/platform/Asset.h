#pragma once

#include "base/MediaTime.h"
#include "platform/WriterInput.h"

#include <cstdint>
#include <vector>

namespace kelvo {

/// One track of a movie file.
struct AssetTrack {
    std::uint32_t trackIdentifier = 0;
    MediaType mediaType = MediaType::video;

    friend bool operator==(const AssetTrack&, const AssetTrack&) = default;
};

/// A movie file opened for reading: what stood in it when it was opened. Implemented by the Linux media
/// adapter and the simulated device. Immutable; thread-safe.
class Asset {
  public:
    virtual ~Asset() = default;

    virtual MediaTime duration() const = 0;

    /// The tracks of one media type, in the file's order.
    virtual std::vector<AssetTrack> tracksWithMediaType(MediaType type) const = 0;
};

}  // namespace kelvo
