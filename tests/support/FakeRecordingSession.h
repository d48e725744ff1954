#pragma once

#include "session/RecordingSession.h"
#include "support/FakeClientProxy.h"

#include <utility>
#include <vector>

namespace kelvo::test {

/// A session that does nothing by itself: a test says what it is, and finishes it when it likes. On one
/// thread.
class FakeRecordingSession : public RecordingSession {
  public:
    struct Clip {
        double start;
        double end;
        friend bool operator==(const Clip&, const Clip&) = default;
    };

    explicit FakeRecordingSession(std::string bundleID) : bundleID_(std::move(bundleID)) {}

    std::string bundleID() const override { return bundleID_; }
    bool isRecording() const override { return recording; }
    bool isBroadcasting() const override { return broadcasting; }
    bool isSystemRecording() const override { return systemRecording; }
    ClientProxyRef clientProxy() const override { return connectedClient ? connectedClient : client; }
    void setClientProxy(ClientProxyRef proxy) override { connectedClient = std::move(proxy); }

    bool isPaused() const override { return paused; }
    bool microphoneEnabled() const override { return microphone; }
    void setMicrophoneEnabled(bool enabled) override { microphone = enabled; }
    bool microphoneEnabledPersistent() const override { return microphonePersistent; }
    void setMicrophoneEnabledPersistent(bool enabled) override { microphonePersistent = enabled; }
    bool hasUserConsentForCamera() const override { return cameraConsent; }
    void setHasUserConsentForCamera(bool consent) override { cameraConsent = consent; }
    bool hasUserConsentForMicrophone() const override { return microphoneConsent; }
    void setHasUserConsentForMicrophone(bool consent) override { microphoneConsent = consent; }
    void pauseSession() override {
        note("pauseSession");
        paused = true;
    }

    void setRecording(bool isRecording) override { recording = isRecording; }
    void setPaused(bool isPaused) override { paused = isPaused; }
    void setExtensionInfo(std::optional<Dictionary> info) override { extensionInfo = std::move(info); }
    void setInterruptedMovieURL(std::optional<URL> movieURL) override {
        note("setInterruptedMovieURL");
        interruptedMovieURL = std::move(movieURL);
    }

    void finishSessionWithHandler(MovieHandler completion) override {
        note("finishSession");
        keepFinish(std::move(completion));
    }
    void finishSessionWithStartClipDuration(double startClipDuration, double endClipDuration,
                                            MovieHandler completion) override {
        note("finishSessionWithStartClipDuration");
        clips.push_back({startClipDuration, endClipDuration});
        keepFinish(std::move(completion));
    }
    void finishAndCleanupSessionFilesWithHandler(std::function<void()> completion) override {
        note("finishAndCleanupSessionFiles");
        cleanup = std::move(completion);
        recording = false;
    }

    void notifyRecordingMayBeStopped() override { note("notifyRecordingMayBeStopped"); }
    void notifyRecordingResumed() override { note("notifyRecordingResumed"); }

    /// Ends the finish that was asked for, with this outcome.
    void completeFinish(const std::optional<URL>& movieURL, const OptionalError& error) {
        std::exchange(finish, nullptr)(movieURL, error);
    }
    /// Ends the clean-up that was asked for.
    void completeCleanup() { std::exchange(cleanup, nullptr)(); }

    bool recording = false;
    bool broadcasting = false;
    bool systemRecording = false;
    bool paused = false;
    bool microphone = false;
    bool microphonePersistent = false;
    bool cameraConsent = false;
    bool microphoneConsent = false;
    /// What `setClientProxy` stored; until then the client is `client`.
    ClientProxyRef connectedClient;
    std::shared_ptr<FakeClientProxy> client = std::make_shared<FakeClientProxy>();
    std::optional<Dictionary> extensionInfo;
    std::optional<URL> interruptedMovieURL;

    /// What was asked of the session, in order.
    std::vector<std::string> requests;
    std::vector<Clip> clips;
    /// What waits for `completeFinish` and `completeCleanup`.
    MovieHandler finish;
    std::function<void()> cleanup;
    /// When set, is told each request as well.
    std::function<void(const std::string& request)> onRequest;

  private:
    void note(const std::string& request) {
        requests.push_back(request);
        if (onRequest) onRequest(request);
    }
    void keepFinish(MovieHandler completion) {
        finish = std::move(completion);
        recording = false;
    }

    const std::string bundleID_;
};

}  // namespace kelvo::test
