#pragma once

#include "platform/PhotoLibrary.h"
#include "platform/linux/files/DeviceRoot.h"
#include "platform/linux/library/MovieLibrary.h"

#include <memory>

namespace kelvo {

/// The photo library as a folder of movies. Thread-safe; what an interrupted change left is cleared away when
/// the library is next used.
class LinuxPhotoLibrary : public PhotoLibrary {
  public:
    LinuxPhotoLibrary(std::shared_ptr<const DeviceRoot> root, std::string folder,
                      std::shared_ptr<Random> random)
        : root_(std::move(root)), movies_(std::move(folder), std::move(random)) {}

    Result<PhotoAsset> createVideoAsset(const URL& movieURL) override;
    std::optional<PhotoAsset> assetWithLocalIdentifier(std::string_view localIdentifier) override;
    Result<std::vector<PhotoAssetDetails>> assets() override;
    OptionalError deleteAsset(const PhotoAsset& asset) override;

  private:
    const std::shared_ptr<const DeviceRoot> root_;
    MovieLibrary movies_;
};

/// Where the recordings are, on the host: "Screen Recordings" in the user's videos folder, or in the videos
/// folder of a device root of one's own unless `isUsersOwn`.
std::string screenRecordingsFolder(const DeviceRoot& root, bool isUsersOwn = false);

}  // namespace kelvo
