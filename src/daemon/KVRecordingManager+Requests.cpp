#include "base/KVLog.h"
#include "daemon/KVRecordingManager.h"
#include "ipc/KVClientProxyFactory.h"

#include <algorithm>

namespace kelvo {
namespace {

void logNotOffered(const char* request) {
    KVLogError("KVRecordingManager: %s is not offered yet", request);
}

}  // namespace

void KVRecordingManager::setupBroadcastWithHostBundleID(const std::string&, const std::string&, const Bytes&,
                                                        const Dictionary&, ErrorHandler handler) {
    logNotOffered("setupBroadcastWithHostBundleID");
    if (handler) handler(errors_->kvUserErrorForCode(kRecordingErrorUnknown));
}

void KVRecordingManager::getCurrentBroadcastImages(ImagesHandler handler) {
    if (handler) handler(currentHostAppImage_.copy(), currentExtensionAppImage_.copy());
}

void KVRecordingManager::getSystemBroadcastExtensionInfo(ExtensionsHandler handler) {
    logNotOffered("getSystemBroadcastExtensionInfo");
    if (handler) handler({}, errors_->kvUserErrorForCode(kRecordingErrorUnknown));
}

void KVRecordingManager::stopRecordingWithHandler(MovieHandler handler) {
    KVLog("KVRecordingManager: stopRecordingWithHandler:");
    stopRecordingWithStartClipDuration(0, 0, std::move(handler));
}

/// The text keeps older words of the request; readers of logs know it so.
void KVRecordingManager::stopRecordingWithStartClipDuration(double startClipDuration, double endClipDuration,
                                                            MovieHandler handler) {
    KVLog("KVRecordingManager: stopRecordingWithStartTimeOffset:endTimeOffset:handler:");
    // Without a handler the movie is thrown away: such a stop has to stay without one.
    sessionManager_->stopRecordingSession(getCallingConnectionRecordingSession(), startClipDuration,
                                          endClipDuration,
                                          handler ? handingOver(endingWork(std::move(handler))) : nullptr);
}

/// `handler`, after the movie that it gets is noted as the calling client's.
MovieHandler KVRecordingManager::handingOver(MovieHandler handler) {
    return [weakSelf = weak_from_this(), process = callingProcess(), handler = std::move(handler)](
               const std::optional<URL>& movieURL, const OptionalError& error) {
        const auto self = weakSelf.lock();
        if (self && movieURL) self->moviesInUse_.handTo(process, *movieURL);
        handler(movieURL, error);
    };
}

std::int32_t KVRecordingManager::callingProcess() const {
    const auto connection = connectionManager_->getCurrentConnection();
    return connection ? connection->processIdentifier() : 0;
}

void KVRecordingManager::saveVideoToCameraRoll(const URL& movieURL, ErrorHandler handler) {
    if (!mayCallerSave(movieURL)) {
        KVLogError("KVRecordingManager: saveVideoToCameraRoll: not a movie that this client may save");
        if (handler) handler(errors_->kvUserErrorForCode(kRecordingErrorFailedToSave));
        return;
    }
    saveVideoToCameraRoll(std::optional(movieURL), std::move(handler));
    moviesInUse_.takeFrom(callingProcess());  // the save holds it itself
}

/// A saved movie is deleted: what is not the daemon's own, or is still being recorded, must not come to that.
/// An application has its own movies, the system's shell all of them.
bool KVRecordingManager::mayCallerSave(const URL& movieURL) const {
    if (!KVTemporaryFileStore::nameInStore(movieURL)) return false;
    if (isBeingWritten(movieURL)) return false;
    const SessionRef session = getCallingConnectionRecordingSession();
    return clientHasSystemEntitlements() || (session && session->ownsMovie(movieURL));
}

bool KVRecordingManager::isMovieInUse(const std::string& name) const {
    return moviesInUse_.contains(name) ||
           isBeingWritten(URL::file(KVTemporaryFileStore::_srTempPath() + "/" + name));
}

bool KVRecordingManager::isBeingWritten(const URL& movieURL) const {
    const auto active = sessionManager_->getActiveRecordingSessions();
    return std::ranges::any_of(active, [&](const auto& each) { return each->isWritingMovie(movieURL); });
}

void KVRecordingManager::pauseRecording() {
    KVLog("KVRecordingManager:pauseRecording");
    const SessionRef session = getCallingConnectionRecordingSession();
    if (!session || session->isSystemRecording() || !session->isRecording() || session->isPaused()) return;
    session->pauseSession();
}

void KVRecordingManager::resumeRecordingWithWindowLayerContextID(std::uint32_t windowLayerContextID) {
    const SessionRef session = getCallingConnectionRecordingSession();
    if (!session || session->isSystemRecording()) return;
    const bool isDeclined = session->isBroadcasting() && session->isRecording() &&
                            !showResumeBroadcastAlertWithSession(session, windowLayerContextID);
    const bool isPausedRecording = session->isRecording() && session->isPaused();
    if (checkContextIDsMatch({windowLayerContextID}) && !isDeclined) {
        KVLog("KVRecordingManager: resumeRecording");
        if (isPausedRecording) session->resumeSessionWithContextID(windowLayerContextID);
        return;
    }
    if (!isPausedRecording) return;
    sessionManager_->stopRecordingSession(
        session, 0, 0, [weakSelf = weak_from_this(), session](const auto& movieURL, const auto&) {
            const auto self = weakSelf.lock();
            if (!self || !movieURL) return;
            self->recordingSessionStoppedWithError(
                session, self->errors_->kvUserErrorForCode(kRecordingErrorNoContextIDMatch), movieURL);
        });
}

void KVRecordingManager::setMicrophoneEnabled(bool enabled) {
    KVLog("KVRecordingManager: setMicrophoneEnabled:%i", enabled ? 1 : 0);
    const SessionRef session = getCallingConnectionRecordingSession();
    if (!session || !session->isRecording()) return;
    session->setMicrophoneEnabled(enabled);
    if (const ClientProxyRef client = session->clientProxy()) client->updateScreenRecordingState();
}

void KVRecordingManager::updateProcessIDForAudioCaptureWithPID(std::int32_t processIdentifier) {
    KVLog("KVRecordingManager: updateProcessIDForAudioCaptureWithPID:%i", processIdentifier);
    if (!clientHasSystemEntitlements()) return;
    const SessionRef session = getCallingConnectionRecordingSession();
    if (session && session->isRecording()) session->updateProcessIDForAudioCaptureWithPID(processIdentifier);
}

void KVRecordingManager::discardRecordingWithHandler(DoneHandler handler) {
    KVLog("KVRecordingManager: discardRecording");
    moviesInUse_.takeFrom(callingProcess());
    const SessionRef session = getCallingConnectionRecordingSession();
    if (!session) {
        if (handler) handler();  // there is nothing to discard
        return;
    }
    if (session->isRecording()) {
        KVLogError("can't discard recording while recording is in progress");
        return;
    }
    session->finishAndCleanupSessionFilesWithHandler(std::move(handler));
}

void KVRecordingManager::synchronousGetCurrentState(StateHandler handler) {
    if (!handler) return;
    const SessionRef session = getCallingConnectionRecordingSession();
    if (!session) return handler(std::nullopt);
    handler(Dictionary{
        {"isRecording", session->isRecording()},
        {"isBroadcasting", session->isBroadcasting()},
        {"microphoneEnabled", session->microphoneEnabled()},
        {"isSystemRecording", session->isSystemRecording()},
        {"hasUserConsentForMicrophone", session->hasUserConsentForMicrophone()},
        {"hasUserConsentForCamera", session->hasUserConsentForCamera()},
        {"microphoneEnabledPersistent", session->microphoneEnabledPersistent()},
    });
}

/// No session is linked to an extension yet, so none can be the preferred one's.
void KVRecordingManager::synchronousIsBroadcastingWithPreferredExtension(const std::string&,
                                                                         BooleanHandler handler) {
    if (handler) handler(false);
}

void KVRecordingManager::setHasUserConsentForCamera(bool consent) {
    if (const SessionRef session = getCallingConnectionRecordingSession())
        session->setHasUserConsentForCamera(consent);
}

void KVRecordingManager::setHasUserConsentForMicrophone(bool consent) {
    if (const SessionRef session = getCallingConnectionRecordingSession())
        session->setHasUserConsentForMicrophone(consent);
}

void KVRecordingManager::setBroadcastURL(const URL&) {
    logNotOffered("setBroadcastURL");
}

void KVRecordingManager::setMicrophoneEnabledPersistent(bool enabled) {
    const SessionRef session = getCallingConnectionRecordingSession();
    if (!session) return;
    session->setMicrophoneEnabledPersistent(enabled);
    if (const ClientProxyRef client = session->clientProxy()) client->updateScreenRecordingState();
}

void KVRecordingManager::reportCameraUsage(std::int32_t) {
    logNotOffered("reportCameraUsage");
}

void KVRecordingManager::connectionManagerDidAcceptNewConnection(
    const IPCConnectionRef& connection, const std::optional<std::string>& bundleIdentifier) {
    moviesInUse_.clientCame(connection->processIdentifier());
    const SessionRef session =
        sessionManager_->recordingSessionInstanceWithBundleIdentifier(bundleIdentifier.value_or(""));
    // A proxy that nobody holds would end the connection of a peer that is welcome.
    if (session) session->setClientProxy(KVClientProxyFactory::clientProxyWithNewConnection(connection));
    expireAcknowledgementExemptionsForBundleID(bundleIdentifier);
}

void KVRecordingManager::applicationDisconnectedWithBundleID(
    const std::optional<std::string>& bundleIdentifier, std::int32_t processIdentifier) {
    KVLog("KVRecordingManager: applicationDisconnected");
    moviesInUse_.clientWent(processIdentifier);
    sessionManager_->applicationDisconnectedWithBundleID(bundleIdentifier.value_or(""), processIdentifier);
    // What is gone comes neither to the foreground nor back.
    applicationStateMonitor_->removeObserverWithProcessIdentifier(processIdentifier);
}

}  // namespace kelvo
