#include "platform/linux/media/LavExportSession.h"

#include "platform/FileSystem.h"
#include "platform/MediaErrors.h"

#include <cerrno>
#include <unistd.h>

namespace kelvo {

std::vector<AssetTrack> LavAsset::tracksWithMediaType(MediaType type) const {
    std::vector<AssetTrack> found;
    for (const AssetTrack& track : tracks_) {
        if (track.mediaType == type) found.push_back(track);
    }
    return found;
}

LavExportSession::LavExportSession(std::shared_ptr<LavAsset> asset, ExportPreset preset,
                                   std::shared_ptr<FileSystem> fileSystem)
    : asset_(std::move(asset)),
      preset_(preset),
      fileSystem_(std::move(fileSystem)),
      queue_("com.quillon.KelvoKit.ExportSession") {}

void LavExportSession::exportAsynchronously(std::function<void()> completion) {
    status_ = Status::waiting;
    queue_.async([self = shared_from_this(), completion = std::move(completion)] {
        self->run();
        completion();
    });
}

void LavExportSession::run() {
    status_ = Status::exporting;
    const auto url = outputURL();
    OptionalError error = mediaError(kMediaErrorMisuse, "no output file");
    if (url && url->isFileURL()) error = exportTo(fileSystem_->hostPath(url->path()));
    if (error) error_.set(error);
    if (!error && !control_.isCancelled) control_.progress = 1;
    const Status success = control_.isCancelled ? Status::cancelled : Status::completed;
    status_ = error ? Status::failed : success;
}

/// What stands at the output path already belongs to somebody else and is left alone.
OptionalError LavExportSession::exportTo(const std::string& outputPath) {
    if (!asset_) return mediaError(kMediaErrorUnreadableMovie, "no movie");
    if (::access(outputPath.c_str(), F_OK) == 0) return KVError::posix(EEXIST, outputPath);
    const ExportRequest request{asset_->path(), outputPath, range_.copy(), mix_.copy()};
    OptionalError error = preset_ == ExportPreset::passThrough ? exportPassThrough(request, control_)
                                                               : exportMix(request, control_);
    const bool someoneElseWasFaster =
        error && error->domain() == kPOSIXErrorDomain && error->code() == EEXIST;
    if ((error || control_.isCancelled) && !someoneElseWasFaster) ::unlink(outputPath.c_str());
    return error;
}

}  // namespace kelvo
