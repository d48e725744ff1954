#include "base/KVLog.h"
#include "ipc/KVConnectionManager.h"
#include "ipc/KVUserErrors.h"

namespace kelvo {
namespace {

constexpr std::string_view kSetupEntitlement = "com.quillon.private.kelvo-kit.can-setup-broadcast";
constexpr std::string_view kSystemEntitlement = "com.quillon.private.kelvo-kit";

bool holds(const IPCConnectionRef& connection, std::string_view entitlement) {
    return connection && holdsEntitlement(*connection, entitlement);
}

/// Gives `handler` the movie where the client finds it.
MovieHandler forPeer(const IPCConnectionRef& connection, MovieHandler handler) {
    if (!connection || !handler) return handler;
    return [weakConnection = std::weak_ptr(connection), handler = std::move(handler)](const auto& movieURL,
                                                                                      const auto& error) {
        // Nobody waits for an answer whose connection is gone.
        const auto peer = weakConnection.lock();
        handler(peer ? urlForPeer(*peer, movieURL) : movieURL, error);
    };
}

}  // namespace

template <typename Forward>
void KVConnectionManager::runOnQueue(const char* request, Forward forward) {
    connectionManagerQueue().sync([&] {
        if (const auto owner = delegate()) forward(*owner);
        KVLog("KVConnectionManager: %s completed", request);
    });
}

template <typename Forward>
void KVConnectionManager::serve(const char* request, Forward forward) {
    KVLog("KVConnectionManager: %s", request);
    setCurrentConnection(transport_->currentConnection());
    runOnQueue(request, forward);
}

void KVConnectionManager::startRecordingWindowLayerContextIDs(
    const std::vector<std::uint32_t>& windowLayerContextIDs, const Size& windowSize, bool microphoneEnabled,
    bool cameraEnabled, bool broadcast, bool systemRecording, bool captureEnabled,
    const std::shared_ptr<IPCEndpoint>& listenerEndpoint, StartHandler handler) {
    serve("startRecordingWindowLayerContextIDs", [&](auto& owner) {
        owner.startRecordingWindowLayerContextIDs(windowLayerContextIDs, windowSize, microphoneEnabled,
                                                  cameraEnabled, broadcast, systemRecording, captureEnabled,
                                                  listenerEndpoint, std::move(handler));
    });
}

void KVConnectionManager::setupBroadcastWithHostBundleID(const std::string& hostBundleID,
                                                         const std::string& broadcastExtensionBundleID,
                                                         const Bytes& broadcastConfigurationData,
                                                         const Dictionary& userInfo, ErrorHandler handler) {
    KVLog("KVConnectionManager: setupBroadcastWithHostBundleID");
    const IPCConnectionRef connection = transport_->currentConnection();
    if (!holds(connection, kSetupEntitlement) && !holds(connection, kSystemEntitlement)) {
        // Bare on purpose: this refusal has no text for the user.
        if (handler)
            handler(KVError(std::string(KVRecordingErrorDomain), kRecordingErrorBroadcastSetupRefused));
        KVLog(
            "KVConnectionManager: setupBroadcastWithHostBundleID failed because client doesn't have "
            "entitlements to setup broadcast");
        return;
    }
    runOnQueue("setupBroadcastWithHostBundleID", [&](auto& owner) {
        owner.setupBroadcastWithHostBundleID(hostBundleID, broadcastExtensionBundleID,
                                             broadcastConfigurationData, userInfo, std::move(handler));
    });
}

void KVConnectionManager::getCurrentBroadcastImages(ImagesHandler handler) {
    serve("getCurrentBroadcastImages",
          [&](auto& owner) { owner.getCurrentBroadcastImages(std::move(handler)); });
}

void KVConnectionManager::getSystemBroadcastExtensionInfo(ExtensionsHandler handler) {
    serve("getSystemBroadcastExtensionInfo",
          [&](auto& owner) { owner.getSystemBroadcastExtensionInfo(std::move(handler)); });
}

void KVConnectionManager::stopRecordingWithHandler(MovieHandler handler) {
    MovieHandler answered = forPeer(transport_->currentConnection(), std::move(handler));
    serve("stopRecordingWithHandler",
          [&](auto& owner) { owner.stopRecordingWithHandler(std::move(answered)); });
}

void KVConnectionManager::stopRecordingWithStartClipDuration(double startClipDuration, double endClipDuration,
                                                             MovieHandler handler) {
    MovieHandler answered = forPeer(transport_->currentConnection(), std::move(handler));
    serve("stopRecordingWithStartClipDuration", [&](auto& owner) {
        owner.stopRecordingWithStartClipDuration(startClipDuration, endClipDuration, std::move(answered));
    });
}

void KVConnectionManager::saveVideoToCameraRoll(const URL& movieURL, ErrorHandler handler) {
    const IPCConnectionRef connection = transport_->currentConnection();
    const URL url = connection ? connection->urlFromPeer(movieURL) : movieURL;
    serve("saveVideoToCameraRoll",
          [&](KVDaemonProtocol& owner) { owner.saveVideoToCameraRoll(url, std::move(handler)); });
}

void KVConnectionManager::pauseRecording() {
    serve("pauseRecording", [](auto& owner) { owner.pauseRecording(); });
}

void KVConnectionManager::resumeRecordingWithWindowLayerContextID(std::uint32_t windowLayerContextID) {
    serve("resumeRecordingWithWindowLayerContextID",
          [&](auto& owner) { owner.resumeRecordingWithWindowLayerContextID(windowLayerContextID); });
}

void KVConnectionManager::setMicrophoneEnabled(bool enabled) {
    serve("setMicrophoneEnabled", [&](auto& owner) { owner.setMicrophoneEnabled(enabled); });
}

void KVConnectionManager::updateProcessIDForAudioCaptureWithPID(std::int32_t processIdentifier) {
    serve("updateProcessIDForAudioCaptureWithPID",
          [&](auto& owner) { owner.updateProcessIDForAudioCaptureWithPID(processIdentifier); });
}

void KVConnectionManager::discardRecordingWithHandler(DoneHandler handler) {
    serve("discardRecordingWithHandler",
          [&](auto& owner) { owner.discardRecordingWithHandler(std::move(handler)); });
}

void KVConnectionManager::synchronousGetCurrentState(StateHandler handler) {
    serve("synchronousGetCurrentState",
          [&](auto& owner) { owner.synchronousGetCurrentState(std::move(handler)); });
}

void KVConnectionManager::synchronousIsBroadcastingWithPreferredExtension(
    const std::string& preferredExtension, BooleanHandler handler) {
    serve("synchronousIsBroadcastingWithPreferredExtension", [&](auto& owner) {
        owner.synchronousIsBroadcastingWithPreferredExtension(preferredExtension, std::move(handler));
    });
}

void KVConnectionManager::setHasUserConsentForCamera(bool consent) {
    serve("setHasUserConsentForCamera", [&](auto& owner) { owner.setHasUserConsentForCamera(consent); });
}

void KVConnectionManager::setHasUserConsentForMicrophone(bool consent) {
    serve("setHasUserConsentForMicrophone",
          [&](auto& owner) { owner.setHasUserConsentForMicrophone(consent); });
}

void KVConnectionManager::setBroadcastURL(const URL& broadcastURL) {
    serve("setBroadcastURL", [&](auto& owner) { owner.setBroadcastURL(broadcastURL); });
}

void KVConnectionManager::setMicrophoneEnabledPersistent(bool enabled) {
    serve("setMicrophoneEnabledPersistent",
          [&](auto& owner) { owner.setMicrophoneEnabledPersistent(enabled); });
}

void KVConnectionManager::reportCameraUsage(std::int32_t cameraUsage) {
    serve("reportCameraUsage", [&](auto& owner) { owner.reportCameraUsage(cameraUsage); });
}

}  // namespace kelvo
