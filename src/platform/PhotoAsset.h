#pragma once

#include <string>

namespace kelvo {

/// One item of the photo library.
struct PhotoAsset {
    std::string localIdentifier;  ///< stable for as long as the item exists
};

}  // namespace kelvo
