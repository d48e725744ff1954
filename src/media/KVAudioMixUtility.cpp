#include "media/KVAudioMixUtility.h"

#include "base/KVLog.h"

#include <string>

namespace kelvo {
namespace {

/// Every audio track of `asset`, at the default volume.
AudioMix mixOfAllAudioTracks(const Asset* asset) {
    AudioMix mix;
    if (asset == nullptr) return mix;
    for (const AssetTrack& track : asset->tracksWithMediaType(MediaType::audio))
        mix.inputParameters.push_back({track.trackIdentifier});
    return mix;
}

}  // namespace

URL KVAudioMixUtility::tempFileURL() const {
    const std::string prefix =
        KVTemporaryFileStore::_srTempPath() + "/" + std::string(KVTemporaryFileStore::kMixedMoviePrefix);
    const auto stamp = static_cast<std::int64_t>(clock_->now().secondsSince1970());
    return URL::file(prefix + std::to_string(stamp) + ".mp4");
}

void KVAudioMixUtility::mixAudioForMovie(const std::optional<URL>& movieURL, MovieHandler completion) const {
    if (!movieURL) {
        completion(std::nullopt, errors_->kvUserErrorForCode(kRecordingErrorMixingFailure));
        return;
    }
    const std::shared_ptr<Asset> asset = media_->openAsset(*movieURL);
    const auto session = media_->createExportSession(asset, ExportPreset::highestQuality);
    session->setOutputURL(tempFileURL());
    session->setOutputFileType(MediaFileType::mpeg4);
    session->setAudioMix(mixOfAllAudioTracks(asset.get()));
    session->exportAsynchronously([session, errors = errors_, completion = std::move(completion)] {
        switch (session->status()) {
            case ExportSession::Status::cancelled:
                KVLogConsole("KVAudioMixUtility: MXAssetExportSessionStatusCancelled");
                completion(std::nullopt, errors->kvUserErrorForCode(kRecordingErrorFailedToSave));
                break;
            case ExportSession::Status::failed:
                KVLogConsole("KVAudioMixUtility: MXAssetExportSessionFailed");
                completion(std::nullopt, errors->kvUserErrorForCode(kRecordingErrorFailedToSave));
                break;
            default:
                completion(session->outputURL(), std::nullopt);
        }
    });
}

}  // namespace kelvo
