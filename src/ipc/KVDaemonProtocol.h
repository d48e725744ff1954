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
    static constexpr Named kMovieURL{"movieURL", "none, or where the movie is for now"};
    static constexpr std::tuple kMessages{
        Message<&P::startRecordingWindowLayerContextIDs>{
            {"startRecordingWindowLayerContextIDs",
             "Starts any kind of recording, after the user's consent where that is needed. Answers when the "
             "recording runs, or with what prevented it."},
            {
                Named{"windowLayerContextIDs", "the layer contexts of the windows to record"},
                Named{"windowSize", "width and height of the window, in points"},
                Named{"microphoneEnabled", "whether to record the microphone"},
                Named{"cameraEnabled", "whether to use the camera"},
                Named{"broadcast", "whether to broadcast to an extension instead of writing a movie"},
                Named{"systemRecording",
                      "whether to record the whole screen, which needs the right "
                      "com.quillon.private.kelvo-kit"},
                Named{"captureEnabled", "whether the caller gets every sample instead of a movie"},
                Named{"listenerEndpoint",
                      "none, or the way to the listener of the extension to which to broadcast"},
            },
            {
                Named{"error", "none when the recording runs"},
                Named{"microphoneEnabled", "whether the microphone is recorded; false after an error"},
                Named{"cameraEnabled", "whether the camera is used; false after an error"},
            }},
        Message<&P::setupBroadcastWithHostBundleID>{
            {"setupBroadcastWithHostBundleID",
             "Prepares a broadcast. Needs the right com.quillon.private.kelvo-kit.can-setup-broadcast or "
             "com.quillon.private.kelvo-kit. Does not answer when there is no such extension."},
            {
                Named{"hostBundleID", "the bundle of the application that will broadcast"},
                Named{"broadcastExtensionBundleID", "the bundle of the broadcast upload extension"},
                Named{"broadcastConfigurationData", "a keyed archive of a KVBroadcastConfiguration"},
                Named{"userInfo", "what the extension is told when the broadcast begins"},
            },
            {Named{"error", "none when it is prepared"}}},
        Message<&P::getCurrentBroadcastImages>{
            {"getCurrentBroadcastImages", "The icons of the broadcast that was prepared last."},
            {},
            {Named{"hostImage", "none, or the icon of the application that broadcasts, as PNG"},
             Named{"extensionImage", "none, or the icon of its extension, as PNG"}}},
        Message<&P::getSystemBroadcastExtensionInfo>{
            {"getSystemBroadcastExtensionInfo", "The broadcast upload extensions that are installed."},
            {},
            {Named{
                 "extensions",
                 "for each one its displayName and extBundleID (strings) and its icon extAppImgData (bytes)"},
             Named{"error", "none when they could be listed"}}},
        Message<&P::stopRecordingWithHandler>{
            {"stopRecordingWithHandler", "Stops the caller's recording and keeps the whole movie."},
            {},
            {kMovieURL, Named{"error", "none when it was stopped"}}},
        Message<&P::stopRecordingWithStartClipDuration>{
            {"stopRecordingWithStartClipDuration",
             "Stops the caller's recording and cuts the movie's ends, when both durations are positive."},
            {Named{"startClipDuration", "seconds to cut from the movie's start"},
             Named{"endClipDuration", "seconds to cut from the movie's end"}},
            {kMovieURL, Named{"error", "none when it was stopped"}}},
        Message<&P::saveVideoToCameraRoll>{{"saveVideoToCameraRoll", "Saves a movie to the photo library."},
                                           {Named{"movieURL", "the movie that a stop has answered"}},
                                           {Named{"error", "none when it was saved"}}},
        Message<&P::pauseRecording>{{"pauseRecording", "Pauses the caller's recording, if one runs."}},
        Message<&P::resumeRecordingWithWindowLayerContextID>{
            {"resumeRecordingWithWindowLayerContextID", "Goes on with the caller's paused recording."},
            {Named{"windowLayerContextID", "the layer context of the window to record from now on"}}},
        Message<&P::setMicrophoneEnabled>{
            {"setMicrophoneEnabled", "Turns the microphone of the caller's running recording on or off."},
            {Named{"enabled", "whether to record the microphone"}}},
        Message<&P::updateProcessIDForAudioCaptureWithPID>{
            {"updateProcessIDForAudioCaptureWithPID",
             "Records the sound of another application. Passed over without the right "
             "com.quillon.private.kelvo-kit."},
            {Named{"processIdentifier", "the application's process, or -1 for none"}}},
        Message<&P::discardRecordingWithHandler>{
            {"discardRecordingWithHandler", "Stops the caller's recording and removes its movie."}},
        Message<&P::synchronousGetCurrentState>{
            {"synchronousGetCurrentState", "How the caller's recording stands."},
            {},
            {Named{"state",
                   "none without a recording session; else the booleans isRecording, isBroadcasting, "
                   "microphoneEnabled, isSystemRecording, hasUserConsentForMicrophone, "
                   "hasUserConsentForCamera and microphoneEnabledPersistent, and perhaps broadcastURL (URL) "
                   "and broadcastExtensionBundleIdentifier (string)"}}},
        Message<&P::synchronousIsBroadcastingWithPreferredExtension>{
            {"synchronousIsBroadcastingWithPreferredExtension",
             "Whether the whole screen is broadcast to this extension."},
            {Named{"preferredExtension", "the extension's bundle"}},
            {Named{"isBroadcasting", "true while it is"}}},
        Message<&P::setHasUserConsentForCamera>{
            {"setHasUserConsentForCamera", "Notes whether the user has agreed to the camera."},
            {Named{"consent", "whether they have"}}},
        Message<&P::setHasUserConsentForMicrophone>{
            {"setHasUserConsentForMicrophone", "Notes whether the user has agreed to the microphone."},
            {Named{"consent", "whether they have"}}},
        Message<&P::setBroadcastURL>{
            {"setBroadcastURL", "Notes where the caller's broadcast can be watched."},
            {Named{"broadcastURL", "the address"}}},
        Message<&P::setMicrophoneEnabledPersistent>{
            {"setMicrophoneEnabledPersistent",
             "Notes whether later recordings of the caller begin with the microphone."},
            {Named{"enabled", "whether they do"}}},
        Message<&P::reportCameraUsage>{
            {"reportCameraUsage", "Notes for the statistics that the caller has used a camera."},
            {Named{"cameraUsage", "1 for the back camera, 2 for the front one"}}},
    };
};

}  // namespace kelvo
