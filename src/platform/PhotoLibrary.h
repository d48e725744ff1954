#pragma once

#include "base/KVError.h"
#include "base/Result.h"
#include "platform/PhotoAsset.h"

#include <optional>
#include <string_view>
#include <vector>

namespace kelvo {

/// The user's photo library. Implemented by the Linux adapter (an index and files in the videos folder) and
/// the simulated device. Any thread; each change is synchronous, happens in whole or not at all, and survives
/// a crash at any point.
class PhotoLibrary {
  public:
    virtual ~PhotoLibrary() = default;

    /// Adds the movie at `movieURL` (a file URL with a path of the device) as a new asset. The file stays
    /// where it is: the asset keeps its content whatever becomes of it. Blocks for as long as taking over the
    /// file needs.
    virtual Result<PhotoAsset> createVideoAsset(const URL& movieURL) = 0;

    /// The asset with this local identifier; none when there is none (any more).
    virtual std::optional<PhotoAsset> assetWithLocalIdentifier(std::string_view localIdentifier) = 0;

    /// Every asset, oldest first. Fails when the library cannot be read.
    virtual Result<std::vector<PhotoAssetDetails>> assets() = 0;

    /// Removes the asset and its file. An asset that is gone already is an error.
    virtual OptionalError deleteAsset(const PhotoAsset& asset) = 0;
};

}  // namespace kelvo
