#include "base/KVLog.h"
#include "daemon/KVRecordingManager.h"

#include <utility>

namespace kelvo {

void KVRecordingManager::stopCurrentRecordingSessionWithHandler(ErrorHandler handler) {
    KVLog("KVRecordingManager:stopCurrentRecordingSession:");
    sessionManager_->stopCurrentRecordingSessionWithHandler(
        [weakSelf = weak_from_this(), handler = std::move(handler)](const auto& movieURL, const auto&) {
            if (const auto self = weakSelf.lock()) self->currentSessionStopped(movieURL);
            if (handler) handler(std::nullopt);
        });
}

/// The movie is saved as it is, and its file stays: whoever starts a recording is not kept waiting.
void KVRecordingManager::currentSessionStopped(const std::optional<URL>& movieURL) {
    KVLog("stop monitoring foreground apps");
    applicationStateMonitor_->removeSystemObserver();
    statusBarAssertion_->invalidateDoubleHeightStatusBar();
    if (!movieURL) return;
    const auto hold = moviesInUse_.hold(*movieURL);
    const auto asset = platform_.photoLibrary->createVideoAsset(*movieURL);
    if (!asset) {
        KVLog("KVRecordingManager:stopCurrentRecordingSession: Video saved to camera roll failed");
        return;
    }
    KVLog("KVRecordingManager:stopCurrentRecordingSession: Video saved to camera roll successful");
    displayScreenRecorderBulletinWithURL(asset->localIdentifier);
}

void KVRecordingManager::prepareForStoppingSession(const SessionRef& session) {
    checkAndPlaySystemRecordSound(session, false);
    clearSystemRecordingUI(session);
    const auto monitor = layoutMonitor();
    if (session && session->isRecording() && monitor) monitor->removeObserver(this);
    currentHostAppImage_.set(std::nullopt);
    currentExtensionAppImage_.set(std::nullopt);
    currentExtensionDisplayName_.set(std::nullopt);
}

void KVRecordingManager::resetStatesForSession(const SessionRef& session) {
    KVLog("KVRecordingManager:resetStatesForSession:");
    if (session) {
        session->setRecording(false);
        session->setPaused(false);
        session->setExtensionInfo(std::nullopt);
    }
    endTransaction();
}

void KVRecordingManager::recordingSessionStoppedWithError(const SessionRef& session,
                                                          const OptionalError& error) {
    recordingSessionStoppedWithError(session, error, std::nullopt);
}

void KVRecordingManager::recordingSessionStoppedWithError(const SessionRef& session,
                                                          const OptionalError& error,
                                                          const std::optional<URL>& movieURL) {
    KVLog("KVRecordingManager:recordingSessionStoppedWithError:movieURL:");
    if (session && session->isSystemRecording()) {
        const bool isBroadcast = session->broadcastExtension() != nullptr;
        showOnAlertQueue([session, error, isBroadcast](KVRecordingManager& manager) {
            if (isBroadcast) {
                manager.showAlertForBroadcastSession(session, error);
            } else {
                manager.showAlertForRecordingSession(session, error);
            }
        });
    }
    clearSystemRecordingUI(session);
    const ClientProxyRef client = session ? session->clientProxy() : nullptr;
    if (client) client->recordingDidStopWithError(error, movieURL);
}

/// Takes away what shows the user that the whole screen is recorded.
void KVRecordingManager::clearSystemRecordingUI(const SessionRef& session) {
    if (!session || !session->isSystemRecording()) return;
    KVLog("stop monitoring foreground apps");
    applicationStateMonitor_->removeSystemObserver();
    if (const auto alert = userNotificationStopRecording_.copy()) alert->cancel();
    if (statusBarAssertion_) statusBarAssertion_->invalidateDoubleHeightStatusBar();
}

}  // namespace kelvo
