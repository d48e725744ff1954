#pragma once

#include "base/Guarded.h"
#include "ipc/KVConnectionManager.h"

#include <functional>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace kelvo::test {

/// A delegate of the connection manager that remembers what it was asked, and answers each handler with the
/// same values. Thread-safe.
class FakeDaemon : public KVConnectionManagerDelegate {
  public:
    using Departure = std::pair<std::optional<std::string>, std::int32_t>;

    void startRecordingWindowLayerContextIDs(const std::vector<std::uint32_t>& windowLayerContextIDs,
                                             const Size& windowSize, bool microphoneEnabled,
                                             bool cameraEnabled, bool broadcast, bool systemRecording,
                                             bool captureEnabled,
                                             const std::shared_ptr<IPCEndpoint>& listenerEndpoint,
                                             StartHandler handler) override {
        Array contextIDs;
        for (const std::uint32_t contextID : windowLayerContextIDs)
            contextIDs.emplace_back(contextID);
        note("startRecordingWindowLayerContextIDs",
             {contextIDs, windowSize.width, windowSize.height, microphoneEnabled, cameraEnabled, broadcast,
              systemRecording, captureEnabled, listenerEndpoint != nullptr});
        endpoint.set(listenerEndpoint);
        if (handler) handler(kError, true, false);
    }
    void setupBroadcastWithHostBundleID(const std::string& hostBundleID,
                                        const std::string& broadcastExtensionBundleID,
                                        const Bytes& broadcastConfigurationData, const Dictionary& userInfo,
                                        ErrorHandler handler) override {
        note("setupBroadcastWithHostBundleID",
             {hostBundleID, broadcastExtensionBundleID, broadcastConfigurationData, userInfo});
        if (handler) handler(std::nullopt);
    }
    void getCurrentBroadcastImages(ImagesHandler handler) override {
        note("getCurrentBroadcastImages");
        if (handler) handler(Bytes{std::byte{1}, std::byte{2}}, std::nullopt);
    }
    void getSystemBroadcastExtensionInfo(ExtensionsHandler handler) override {
        note("getSystemBroadcastExtensionInfo");
        if (handler) handler({{{"displayName", "One"}}, {{"displayName", "Two"}}}, std::nullopt);
    }
    void stopRecordingWithHandler(MovieHandler handler) override {
        if (keepsStopHandler)
            keptStopHandler.set(std::exchange(handler, nullptr));  // before a waiting test is woken
        note("stopRecordingWithHandler");
        if (handler) handler(URL("movie:taken"), std::nullopt);
    }
    void stopRecordingWithStartClipDuration(double startClipDuration, double endClipDuration,
                                            MovieHandler handler) override {
        note("stopRecordingWithStartClipDuration", {startClipDuration, endClipDuration});
        if (handler) handler(std::nullopt, kError);
    }
    void saveVideoToCameraRoll(const URL& movieURL, ErrorHandler handler) override {
        note("saveVideoToCameraRoll", {movieURL});
        if (handler) handler(kError);
    }
    void pauseRecording() override { note("pauseRecording"); }
    void resumeRecordingWithWindowLayerContextID(std::uint32_t windowLayerContextID) override {
        note("resumeRecordingWithWindowLayerContextID", {windowLayerContextID});
    }
    void setMicrophoneEnabled(bool enabled) override { note("setMicrophoneEnabled", {enabled}); }
    void updateProcessIDForAudioCaptureWithPID(std::int32_t processIdentifier) override {
        note("updateProcessIDForAudioCaptureWithPID", {processIdentifier});
    }
    void discardRecordingWithHandler(DoneHandler handler) override {
        note("discardRecordingWithHandler");
        if (handler) handler();
    }
    void synchronousGetCurrentState(StateHandler handler) override {
        note("synchronousGetCurrentState");
        if (handler) handler(Dictionary{{"isRecording", true}});
    }
    void synchronousIsBroadcastingWithPreferredExtension(const std::string& preferredExtension,
                                                         BooleanHandler handler) override {
        note("synchronousIsBroadcastingWithPreferredExtension", {preferredExtension});
        if (handler) handler(true);
    }
    void setHasUserConsentForCamera(bool consent) override { note("setHasUserConsentForCamera", {consent}); }
    void setHasUserConsentForMicrophone(bool consent) override {
        note("setHasUserConsentForMicrophone", {consent});
    }
    void setBroadcastURL(const URL& broadcastURL) override { note("setBroadcastURL", {broadcastURL}); }
    void setMicrophoneEnabledPersistent(bool enabled) override {
        note("setMicrophoneEnabledPersistent", {enabled});
    }
    void reportCameraUsage(std::int32_t cameraUsage) override { note("reportCameraUsage", {cameraUsage}); }

    void connectionManagerDidAcceptNewConnection(
        const IPCConnectionRef& connection, const std::optional<std::string>& bundleIdentifier) override {
        arrivals.with(
            [&](auto& all) { all.emplace_back(bundleIdentifier, connection->processIdentifier()); });
        if (const auto runs = onArrival.copy()) runs();
    }
    void applicationDisconnectedWithBundleID(const std::optional<std::string>& bundleIdentifier,
                                             std::int32_t processIdentifier) override {
        departures.with([&](auto& all) { all.emplace_back(bundleIdentifier, processIdentifier); });
    }

    /// The names of the requests so far, in order, and their arguments.
    std::vector<std::string> requests() const { return requests_.copy(); }
    std::vector<Array> arguments() const { return arguments_.copy(); }

    Guarded<std::vector<Departure>> arrivals;
    Guarded<std::vector<Departure>> departures;
    Guarded<std::shared_ptr<IPCEndpoint>> endpoint;
    /// When set, the handler of a stop is kept instead of called.
    std::atomic<bool> keepsStopHandler{false};
    Guarded<MovieHandler> keptStopHandler;
    /// When set, run inside each request, and while this daemon is told of a client's arrival.
    Guarded<std::function<void(const std::string& request)>> onRequest;
    Guarded<std::function<void()>> onArrival;

    inline static const KVError kError{"domain", -5, {{"key", "text"}}};

  private:
    void note(const std::string& request, Array values = {}) {
        requests_.with([&](auto& all) { all.push_back(request); });
        arguments_.with([&](auto& all) { all.push_back(std::move(values)); });
        if (const auto runs = onRequest.copy()) runs(request);
    }

    Guarded<std::vector<std::string>> requests_;
    Guarded<std::vector<Array>> arguments_;
};

}  // namespace kelvo::test
