#pragma once

#include <string>

namespace kelvo {

/// One item of the photo library.
struct PhotoAsset {
    /// Stable for as long as the item exists, never used again: a UUID, which something may follow after a
    /// slash.
    std::string localIdentifier;

    friend bool operator==(const PhotoAsset&, const PhotoAsset&) = default;
};

}  // namespace kelvo
