#include "platform/linux/media/LavMediaService.h"

#include "base/KVLog.h"
#include "platform/linux/media/LavExportSession.h"
#include "platform/linux/media/LavFileWriter.h"
#include "platform/linux/media/LavWriterInput.h"
#include "platform/linux/media/MovieReader.h"
#include "platform/linux/media/SampleQueue.h"

#include <cerrno>
#include <filesystem>
#include <sys/stat.h>

namespace kelvo {
namespace {

/// Whether a file can be made in the folder of `path`.
OptionalError checkFolder(const std::string& path) {
    const std::string folder = std::filesystem::path(path).parent_path().string();
    struct stat status {};
    if (::stat(folder.c_str(), &status) != 0) return KVError::posix(errno, folder);
    if (!S_ISDIR(status.st_mode)) return KVError::posix(ENOTDIR, folder);
    return std::nullopt;
}

}  // namespace

Result<std::shared_ptr<MediaFileWriter>> LavMediaService::createFileWriter(const URL& url, MediaFileType) {
    if (!url.isFileURL()) return KVError::posix(EINVAL, url.absoluteString());
    const std::string path = fileSystem_->hostPath(url.path());
    if (const OptionalError error = checkFolder(path)) return *error;
    return std::shared_ptr<MediaFileWriter>(std::make_shared<LavFileWriter>(url, path));
}

std::shared_ptr<WriterInput> LavMediaService::createWriterInput(MediaType type,
                                                                const Dictionary& outputSettings) {
    return std::make_shared<LavWriterInput>(type, outputSettings);
}

std::shared_ptr<BufferQueue> LavMediaService::createBufferQueue() {
    return std::make_shared<SampleQueue>();
}

std::shared_ptr<Asset> LavMediaService::openAsset(const URL& url) {
    if (!url.isFileURL()) return nullptr;
    const std::string path = fileSystem_->hostPath(url.path());
    const auto reader = MovieReader::open(path);
    if (!reader) {
        KVLogError("cannot open %s: %s", path.c_str(), reader.error().description().c_str());
        return nullptr;
    }
    std::vector<AssetTrack> tracks = (*reader)->tracks(MediaType::video);
    for (const AssetTrack& track : (*reader)->tracks(MediaType::audio))
        tracks.push_back(track);
    return std::make_shared<LavAsset>(path, (*reader)->duration(), std::move(tracks));
}

std::shared_ptr<ExportSession> LavMediaService::createExportSession(std::shared_ptr<Asset> asset,
                                                                    ExportPreset preset) {
    // Every asset that reaches this service was opened by it.
    return std::make_shared<LavExportSession>(std::static_pointer_cast<LavAsset>(asset), preset, fileSystem_);
}

}  // namespace kelvo
