#pragma once

#include "base/Date.h"

#include <cstdint>
#include <string>

namespace kelvo {

/// One item of the photo library.
struct PhotoAsset {
    /// Stable for as long as the item exists, never used again: a UUID, which something may follow after a
    /// slash.
    std::string localIdentifier;

    friend bool operator==(const PhotoAsset&, const PhotoAsset&) = default;
};

/// The same with what a person wants to know of it.
struct PhotoAssetDetails {
    PhotoAsset asset;
    std::string hostPath;    ///< where any process of this machine finds its file
    Date creationDate;       ///< the last change of the movie that it was made from
    std::uint64_t size = 0;  ///< bytes
};

}  // namespace kelvo
