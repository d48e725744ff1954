#include "base/KVLog.h"
#include "base/LocalizedFormat.h"
#include "daemon/KVRecordingManager.h"

#include <utility>

namespace kelvo {

void KVRecordingManager::saveVideoToCameraRoll(const std::optional<URL>& movieURL, ErrorHandler completion) {
    KVLog("KVRecordingManager: saveVideoToCameraRoll:");
    mixer_->mixAudioForMovie(movieURL, [weakSelf = weak_from_this(), movieURL,
                                        completion = endingWork(holding(movieURL, std::move(completion)))](
                                           const auto& mixedURL, const auto& error) {
        if (error) KVLogError("Error Mixing video Audio tracks");
        if (const auto self = weakSelf.lock()) self->saveFinishedMovie(movieURL, mixedURL, completion);
    });
}

/// `completion`, which may be none, keeping the movie in use until it is dropped.
ErrorHandler KVRecordingManager::holding(const std::optional<URL>& movieURL, ErrorHandler completion) {
    return [hold = movieURL ? moviesInUse_.hold(*movieURL) : nullptr,
            completion = std::move(completion)](const OptionalError& error) {
        if (completion) completion(error);
    };
}

/// Saves the mixed movie, or the unmixed one when there is no other, and leaves neither behind.
void KVRecordingManager::saveFinishedMovie(const std::optional<URL>& movieURL,
                                           const std::optional<URL>& mixedURL,
                                           const ErrorHandler& completion) {
    const std::optional<URL> file = mixedURL ? mixedURL : movieURL;
    const Result<PhotoAsset> asset = file ? platform_.photoLibrary->createVideoAsset(*file)
                                          : errors_->kvUserErrorForCode(kRecordingErrorFailedToSave);
    const OptionalError saveError = asset.optionalError();
    if (saveError) {
        showOnAlertQueue([saveError](KVRecordingManager& manager) {
            manager.showAlertRecordingSessionFailedToSaveFile(nullptr, saveError);
        });
    } else {
        KVLog("KVRecordingManager:saveVideoToCameraRoll: Video saved to camera roll successful");
        displayScreenRecorderBulletinWithURL(asset->localIdentifier);
        if (isPhotoLibraryChannelEnabled())
            KVLog("<Gallery>[Gallery][com.quillon.KelvoKit]: Saved screen recording.");
    }
    if (movieURL && file != movieURL) removeSavedFile(*movieURL, nullptr);
    if (!file) {
        if (completion) completion(saveError);
        return;
    }
    removeSavedFile(*file, [saveError, completion](const OptionalError& error) {
        if (error) KVLogError("error removing file with code: %i", static_cast<int>(error->code()));
        if (completion) completion(error ? error : saveError);
    });
}

/// An application that records anew while its movie is saved has put another file in its place by then.
void KVRecordingManager::removeSavedFile(const URL& url, ErrorHandler completion) {
    if (!isBeingWritten(url)) {
        fileStore_->_srRemoveFile(url, std::move(completion));
    } else if (completion) {
        completion(std::nullopt);
    }
}

bool KVRecordingManager::isPhotoLibraryChannelEnabled() const {
    return platform_.preferences->value("KVPhotoLibraryDiagnostics", kPreferencesDomain)
        .asBool()
        .value_or(false);
}

void KVRecordingManager::failedToSaveRecordingForRecordingSession(const SessionRef& session,
                                                                  const KVError& error) {
    if (session && session->isSystemRecording()) {
        showOnAlertQueue([session, error](KVRecordingManager& manager) {
            manager.showAlertRecordingSessionFailedToSaveFile(session, error);
        });
    }
    KVLog("KVRecordingManager:saveVideoToCameraRoll: Video saved to camera roll failed");
}

void KVRecordingManager::showOnAlertQueue(std::function<void(KVRecordingManager&)> show) {
    kelvoAlertQueue().async([weakSelf = weak_from_this(), show = std::move(show)] {
        if (const auto self = weakSelf.lock()) show(*self);
    });
}

void KVRecordingManager::showAlertForRecordingSession(const SessionRef&, const OptionalError& error) {
    showFailureAlert("RECORDING_FAILED_ALERT_MESSAGE_FORMAT", error);
}

void KVRecordingManager::showAlertRecordingSessionFailedToSaveFile(const SessionRef&,
                                                                   const OptionalError& error) {
    showFailureAlert("RECORDING_FAILED_TO_SAVE_ALERT_MESSAGE_FORMAT", error);
}

void KVRecordingManager::showAlertForBroadcastSession(const SessionRef&, const OptionalError& error) {
    KVLogError("KVRecordingManager: showAlertForBroadcastSession is not offered yet: %d",
               error ? static_cast<int>(error->code()) : 0);
}

bool KVRecordingManager::showResumeBroadcastAlertWithSession(const SessionRef&, std::uint32_t) {
    KVLogError("KVRecordingManager: showResumeBroadcastAlertWithSession is not offered yet");
    return true;
}

/// Readers of logs know both alerts, and their failures, by the same texts.
void KVRecordingManager::showFailureAlert(std::string_view messageKey, const OptionalError& error) {
    SystemAlertContent content;
    content.header = localized("RECORDING_STATUSBAR_TAPPED_ALERT_TITLE");
    content.message =
        formatLocalized(localized(messageKey), error ? error->localizedDescription() : std::string());
    content.defaultButton = localized("BROADCAST_FAILED_ALERT_OK_BUTTON");
    const auto alert = platform_.alerts->createAlert(content);
    if (!alert) {
        KVLogError("error showing broadcast stopped with error alert");
    } else if ((*alert)->waitForResponse() == SystemAlertResponse::defaultButton) {
        KVLogError(
            "KVRecordingManager: showAlertForRecordingSession: user has hit okay, alert will be dismissed");
    }
}

}  // namespace kelvo
