#include "base/KVLog.h"
#include "daemon/KVRecordingManager.h"

namespace kelvo {

void KVRecordingManager::prepareForStoppingSession(const SessionRef& session) {
    clearSystemRecordingUI(session);
    if (session && session->isRecording() && layoutMonitor_) layoutMonitor_->removeObserver(this);
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
                                                          const OptionalError& error,
                                                          const std::optional<URL>& movieURL) {
    KVLog("KVRecordingManager:recordingSessionStoppedWithError:movieURL:");
    clearSystemRecordingUI(session);
    const ClientProxyRef client = session ? session->clientProxy() : nullptr;
    if (client) client->recordingDidStopWithError(error, movieURL);
}

void KVRecordingManager::failedToSaveRecordingForRecordingSession(const SessionRef&, const KVError&) {
    KVLog("KVRecordingManager:saveVideoToCameraRoll: Video saved to camera roll failed");
}

/// There is no photo library to save to yet: the movie stays in the store and the caller is told.
void KVRecordingManager::saveVideoToCameraRoll(const std::optional<URL>&, ErrorHandler completion) {
    KVLog("KVRecordingManager: saveVideoToCameraRoll:");
    if (completion) completion(errors_->kvUserErrorForCode(kRecordingErrorFailedToSave));
}

/// Takes away what shows the user that the whole screen is recorded.
void KVRecordingManager::clearSystemRecordingUI(const SessionRef& session) {
    if (!session || !session->isSystemRecording()) return;
    KVLog("stop monitoring foreground apps");
    if (const auto alert = userNotificationStopRecording_.copy()) alert->cancel();
    if (statusBarAssertion_) statusBarAssertion_->invalidateDoubleHeightStatusBar();
}

}  // namespace kelvo
