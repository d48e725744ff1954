#include "platform/simulated/SimulatedPhotoLibrary.h"

#include <algorithm>
#include <cerrno>
#include <iterator>

namespace kelvo {
namespace {

/// The UUID counts the assets.
std::string localIdentifier(int number) {
    const std::string digits = std::to_string(number);
    return "5A000000-0000-4000-8000-" + std::string(12 - digits.size(), '0') + digits + "/L0/001";
}

}  // namespace

Result<PhotoAsset> SimulatedPhotoLibrary::createVideoAsset(const URL& movieURL) {
    if (const OptionalError fault = faults_->take("PhotoLibrary.createVideoAsset")) return *fault;
    const auto file = fileSystem_->attributesOfItem(movieURL.path());
    if (!movieURL.isFileURL() || !file) return KVError::posix(ENOENT, movieURL.path());
    return content_.with([&](Content& content) {
        PhotoAsset asset{localIdentifier(++content.created)};
        content.items.push_back({asset, movieURL.path(), file->modificationDate, file->size});
        return asset;
    });
}

std::optional<PhotoAsset> SimulatedPhotoLibrary::assetWithLocalIdentifier(std::string_view localIdentifier) {
    for (const Item& item : items()) {
        if (item.asset.localIdentifier == localIdentifier) return item.asset;
    }
    return std::nullopt;
}

Result<std::vector<PhotoAssetDetails>> SimulatedPhotoLibrary::assets() {
    if (const OptionalError fault = faults_->take("PhotoLibrary.assets")) return *fault;
    std::vector<PhotoAssetDetails> details;
    for (const Item& item : items())
        details.push_back({item.asset, item.moviePath, item.creationDate, item.size});
    return details;
}

OptionalError SimulatedPhotoLibrary::deleteAsset(const PhotoAsset& asset) {
    if (OptionalError fault = faults_->take("PhotoLibrary.deleteAsset")) return fault;
    const std::size_t deleted = content_.with([&](Content& content) {
        return std::erase_if(content.items, [&](const Item& item) { return item.asset == asset; });
    });
    return deleted > 0 ? OptionalError() : KVError::posix(ENOENT, asset.localIdentifier);
}

}  // namespace kelvo
