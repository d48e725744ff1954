#pragma once

#include "ipc/KVDaemonProtocol.h"

namespace kelvo {

/// The daemon as its clients see it: sends requests over one connection. A request that cannot be delivered,
/// or whose reply can no longer come, goes to the error handler. Thread-safe.
class KVRemoteDaemon : public KVDaemonProtocol {
  public:
    using P = KVDaemonProtocol;
    KVRemoteDaemon(IPCConnection& connection, std::function<void(const KVError&)> errorHandler)
        : sender_(connection, std::move(errorHandler)) {}

    void startRecordingWindowLayerContextIDs(const std::vector<std::uint32_t>& windowLayerContextIDs,
                                             const Size& windowSize, bool microphoneEnabled,
                                             bool cameraEnabled, bool broadcast, bool systemRecording,
                                             bool captureEnabled,
                                             const std::shared_ptr<IPCEndpoint>& listenerEndpoint,
                                             StartHandler handler) override {
        sender_.send<&P::startRecordingWindowLayerContextIDs>(
            windowLayerContextIDs, windowSize, microphoneEnabled, cameraEnabled, broadcast, systemRecording,
            captureEnabled, listenerEndpoint, handler);
    }
    void setupBroadcastWithHostBundleID(const std::string& hostBundleID,
                                        const std::string& broadcastExtensionBundleID,
                                        const Bytes& broadcastConfigurationData, const Dictionary& userInfo,
                                        ErrorHandler handler) override {
        sender_.send<&P::setupBroadcastWithHostBundleID>(hostBundleID, broadcastExtensionBundleID,
                                                         broadcastConfigurationData, userInfo, handler);
    }
    void getCurrentBroadcastImages(ImagesHandler handler) override {
        sender_.send<&P::getCurrentBroadcastImages>(handler);
    }
    void getSystemBroadcastExtensionInfo(ExtensionsHandler handler) override {
        sender_.send<&P::getSystemBroadcastExtensionInfo>(handler);
    }
    void stopRecordingWithHandler(MovieHandler handler) override {
        sender_.send<&P::stopRecordingWithHandler>(handler);
    }
    void stopRecordingWithStartClipDuration(double startClipDuration, double endClipDuration,
                                            MovieHandler handler) override {
        sender_.send<&P::stopRecordingWithStartClipDuration>(startClipDuration, endClipDuration, handler);
    }
    void saveVideoToCameraRoll(const URL& movieURL, ErrorHandler handler) override {
        sender_.send<&P::saveVideoToCameraRoll>(movieURL, handler);
    }
    void pauseRecording() override { sender_.send<&P::pauseRecording>(); }
    void resumeRecordingWithWindowLayerContextID(std::uint32_t windowLayerContextID) override {
        sender_.send<&P::resumeRecordingWithWindowLayerContextID>(windowLayerContextID);
    }
    void setMicrophoneEnabled(bool enabled) override { sender_.send<&P::setMicrophoneEnabled>(enabled); }
    void updateProcessIDForAudioCaptureWithPID(std::int32_t processIdentifier) override {
        sender_.send<&P::updateProcessIDForAudioCaptureWithPID>(processIdentifier);
    }
    void discardRecordingWithHandler(DoneHandler handler) override {
        sender_.send<&P::discardRecordingWithHandler>(handler);
    }
    void synchronousGetCurrentState(StateHandler handler) override {
        sender_.send<&P::synchronousGetCurrentState>(handler);
    }
    void synchronousIsBroadcastingWithPreferredExtension(const std::string& preferredExtension,
                                                         BooleanHandler handler) override {
        sender_.send<&P::synchronousIsBroadcastingWithPreferredExtension>(preferredExtension, handler);
    }
    void setHasUserConsentForCamera(bool consent) override {
        sender_.send<&P::setHasUserConsentForCamera>(consent);
    }
    void setHasUserConsentForMicrophone(bool consent) override {
        sender_.send<&P::setHasUserConsentForMicrophone>(consent);
    }
    void setBroadcastURL(const URL& broadcastURL) override {
        sender_.send<&P::setBroadcastURL>(broadcastURL);
    }
    void setMicrophoneEnabledPersistent(bool enabled) override {
        sender_.send<&P::setMicrophoneEnabledPersistent>(enabled);
    }
    void reportCameraUsage(std::int32_t cameraUsage) override {
        sender_.send<&P::reportCameraUsage>(cameraUsage);
    }

  private:
    const RemoteSender sender_;
};

}  // namespace kelvo
