#include "platform/linux/library/LinuxPhotoLibrary.h"

#include "base/KVLog.h"
#include "platform/linux/library/UserFolders.h"

#include <algorithm>
#include <cerrno>

namespace kelvo {
namespace {

constexpr std::string_view kFolderName = "/Screen Recordings";
constexpr std::string_view kVideosOfRoot = "/private/var/mobile/Media/Videos";

}  // namespace

Result<PhotoAsset> LinuxPhotoLibrary::createVideoAsset(const URL& movieURL) {
    if (!movieURL.isFileURL()) return KVError::posix(EINVAL, movieURL.path());
    const auto identifier = movies_.add(root_->hostPath(movieURL.path()));
    if (!identifier) return identifier.error();
    return PhotoAsset{*identifier};
}

std::optional<PhotoAsset> LinuxPhotoLibrary::assetWithLocalIdentifier(std::string_view localIdentifier) {
    const auto movies = movies_.movies();
    if (!movies) {
        KVLogError("cannot read the movie library: %s", movies.error().localizedDescription().c_str());
        return std::nullopt;
    }
    const bool isThere = std::ranges::any_of(
        *movies, [&](const LibraryMovie& movie) { return movie.identifier == localIdentifier; });
    return isThere ? std::optional(PhotoAsset{std::string(localIdentifier)}) : std::nullopt;
}

Result<std::vector<PhotoAssetDetails>> LinuxPhotoLibrary::assets() {
    const auto movies = movies_.movies();
    if (!movies) return movies.error();
    std::vector<PhotoAssetDetails> assets;
    for (const LibraryMovie& movie : *movies)
        assets.push_back({{movie.identifier}, movie.path, movie.creationDate, movie.size});
    return assets;
}

OptionalError LinuxPhotoLibrary::deleteAsset(const PhotoAsset& asset) {
    return movies_.remove(asset.localIdentifier);
}

std::string screenRecordingsFolder(const DeviceRoot& root, bool isUsersOwn) {
    const std::string videos = isUsersOwn || root.root().empty() ? videosFolder(UserEnvironment::ofProcess())
                                                                 : root.hostPath(kVideosOfRoot);
    return videos + std::string(kFolderName);
}

}  // namespace kelvo
