#pragma once

#include "base/Geometry.h"
#include "ipc/ProtocolTable.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace kelvo {

/// What a client may ask of the daemon. A handler may be empty; it is called at most once, from any thread,
/// and for some requests under some conditions never.
class KVDaemonProtocol {
  public:
    /// No error and what is recorded besides the screen; or an error and twice false.
    using StartHandler =
        std::function<void(const OptionalError& error, bool microphoneEnabled, bool cameraEnabled)>;
    /// The icons of the application that broadcasts and of the extension, as PNG.
    using ImagesHandler = std::function<void(const std::optional<Bytes>& hostImage,
                                             const std::optional<Bytes>& extensionImage)>;
    using ExtensionsHandler =
        std::function<void(const std::vector<Dictionary>& extensions, const OptionalError& error)>;
    /// None when the caller has no session.
    using StateHandler = std::function<void(const std::optional<Dictionary>& state)>;
    using BooleanHandler = std::function<void(bool value)>;
    using DoneHandler = std::function<void()>;

    virtual ~KVDaemonProtocol() = default;

    /// Starts any kind of recording: of these windows, of the whole screen, for the client's own capture, or
    /// as a broadcast to the extension behind the endpoint. Sizes are in points.
    virtual void startRecordingWindowLayerContextIDs(const std::vector<std::uint32_t>& windowLayerContextIDs,
                                                     const Size& windowSize, bool microphoneEnabled,
                                                     bool cameraEnabled, bool broadcast, bool systemRecording,
                                                     bool captureEnabled,
                                                     const std::shared_ptr<IPCEndpoint>& listenerEndpoint,
                                                     StartHandler handler) = 0;
    /// `broadcastConfigurationData` is a keyed archive of a `KVBroadcastConfiguration`.
    virtual void setupBroadcastWithHostBundleID(const std::string& hostBundleID,
                                                const std::string& broadcastExtensionBundleID,
                                                const Bytes& broadcastConfigurationData,
                                                const Dictionary& userInfo, ErrorHandler handler) = 0;
    virtual void getCurrentBroadcastImages(ImagesHandler handler) = 0;
    virtual void getSystemBroadcastExtensionInfo(ExtensionsHandler handler) = 0;
    virtual void stopRecordingWithHandler(MovieHandler handler) = 0;
    /// Seconds to cut from the movie's ends.
    virtual void stopRecordingWithStartClipDuration(double startClipDuration, double endClipDuration,
                                                    MovieHandler handler) = 0;
    virtual void saveVideoToCameraRoll(const URL& movieURL, ErrorHandler handler) = 0;
    virtual void pauseRecording() = 0;
    virtual void resumeRecordingWithWindowLayerContextID(std::uint32_t windowLayerContextID) = 0;
    virtual void setMicrophoneEnabled(bool enabled) = 0;
    virtual void updateProcessIDForAudioCaptureWithPID(std::int32_t processIdentifier) = 0;
    virtual void discardRecordingWithHandler(DoneHandler handler) = 0;
    virtual void synchronousGetCurrentState(StateHandler handler) = 0;
    virtual void synchronousIsBroadcastingWithPreferredExtension(const std::string& preferredExtension,
                                                                 BooleanHandler handler) = 0;
    virtual void setHasUserConsentForCamera(bool consent) = 0;
    virtual void setHasUserConsentForMicrophone(bool consent) = 0;
    virtual void setBroadcastURL(const URL& broadcastURL) = 0;
    virtual void setMicrophoneEnabledPersistent(bool enabled) = 0;
    virtual void reportCameraUsage(std::int32_t cameraUsage) = 0;
};

/// The table of the requests. Their order is no part of the wire.
template <>
struct ProtocolTable<KVDaemonProtocol> {
    using P = KVDaemonProtocol;
    static constexpr std::string_view kName = "com.quillon.KelvoKit.KVDaemonProtocol";
    static constexpr std::tuple kMessages{
        Message<&P::startRecordingWindowLayerContextIDs>{
            "startRecordingWindowLayerContextIDs",
            {"windowLayerContextIDs", "windowSize", "microphoneEnabled", "cameraEnabled", "broadcast",
             "systemRecording", "captureEnabled", "listenerEndpoint"},
            {"error", "microphoneEnabled", "cameraEnabled"}},
        Message<&P::setupBroadcastWithHostBundleID>{
            "setupBroadcastWithHostBundleID",
            {"hostBundleID", "broadcastExtensionBundleID", "broadcastConfigurationData", "userInfo"},
            {"error"}},
        Message<&P::getCurrentBroadcastImages>{
            "getCurrentBroadcastImages", {}, {"hostImage", "extensionImage"}},
        Message<&P::getSystemBroadcastExtensionInfo>{
            "getSystemBroadcastExtensionInfo", {}, {"extensions", "error"}},
        Message<&P::stopRecordingWithHandler>{"stopRecordingWithHandler", {}, {"movieURL", "error"}},
        Message<&P::stopRecordingWithStartClipDuration>{"stopRecordingWithStartClipDuration",
                                                        {"startClipDuration", "endClipDuration"},
                                                        {"movieURL", "error"}},
        Message<&P::saveVideoToCameraRoll>{"saveVideoToCameraRoll", {"movieURL"}, {"error"}},
        Message<&P::pauseRecording>{"pauseRecording"},
        Message<&P::resumeRecordingWithWindowLayerContextID>{"resumeRecordingWithWindowLayerContextID",
                                                             {"windowLayerContextID"}},
        Message<&P::setMicrophoneEnabled>{"setMicrophoneEnabled", {"enabled"}},
        Message<&P::updateProcessIDForAudioCaptureWithPID>{"updateProcessIDForAudioCaptureWithPID",
                                                           {"processIdentifier"}},
        Message<&P::discardRecordingWithHandler>{"discardRecordingWithHandler"},
        Message<&P::synchronousGetCurrentState>{"synchronousGetCurrentState", {}, {"state"}},
        Message<&P::synchronousIsBroadcastingWithPreferredExtension>{
            "synchronousIsBroadcastingWithPreferredExtension", {"preferredExtension"}, {"isBroadcasting"}},
        Message<&P::setHasUserConsentForCamera>{"setHasUserConsentForCamera", {"consent"}},
        Message<&P::setHasUserConsentForMicrophone>{"setHasUserConsentForMicrophone", {"consent"}},
        Message<&P::setBroadcastURL>{"setBroadcastURL", {"broadcastURL"}},
        Message<&P::setMicrophoneEnabledPersistent>{"setMicrophoneEnabledPersistent", {"enabled"}},
        Message<&P::reportCameraUsage>{"reportCameraUsage", {"cameraUsage"}},
    };
};

}  // namespace kelvo
