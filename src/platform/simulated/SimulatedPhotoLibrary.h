#pragma once

#include "base/Guarded.h"
#include "platform/PhotoLibrary.h"
#include "platform/simulated/SimulatedFaults.h"
#include "platform/simulated/SimulatedFileSystem.h"

#include <memory>
#include <string>
#include <vector>

namespace kelvo {

/// A photo library that remembers which movies it was given. Takes only files that exist; fails when
/// "PhotoLibrary.createVideoAsset", "PhotoLibrary.assets" or "PhotoLibrary.deleteAsset" was ordered to.
/// Thread-safe.
class SimulatedPhotoLibrary : public PhotoLibrary {
  public:
    struct Item {
        PhotoAsset asset;
        std::string moviePath;  ///< where the movie lay that it was made from
        Date creationDate;
        std::uint64_t size = 0;
    };

    SimulatedPhotoLibrary(std::shared_ptr<SimulatedFileSystem> fileSystem,
                          std::shared_ptr<SimulatedFaults> faults)
        : fileSystem_(std::move(fileSystem)), faults_(std::move(faults)) {}

    Result<PhotoAsset> createVideoAsset(const URL& movieURL) override;
    std::optional<PhotoAsset> assetWithLocalIdentifier(std::string_view localIdentifier) override;
    Result<std::vector<PhotoAssetDetails>> assets() override;
    OptionalError deleteAsset(const PhotoAsset& asset) override;

    /// What the library holds, oldest first.
    std::vector<Item> items() const { return content_.copy().items; }

  private:
    struct Content {
        std::vector<Item> items;
        int created = 0;
    };

    const std::shared_ptr<SimulatedFileSystem> fileSystem_;
    const std::shared_ptr<SimulatedFaults> faults_;
    Guarded<Content> content_;
};

}  // namespace kelvo
