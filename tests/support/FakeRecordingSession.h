#pragma once

#include "session/RecordingSession.h"
#include "support/FakeClientProxy.h"

#include <atomic>
#include <utility>
#include <vector>

namespace kelvo::test {

/// A session that does nothing by itself: a test says what it is, and finishes it when it likes. On one
/// thread, but for whether it is recording.
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

    bool isCapturing() const override { return capturing; }
    std::optional<Dictionary> extensionInfo() const override { return extension; }
    std::optional<URL> interruptedMovieURL() const override { return interruptedMovie; }
    bool ownsMovie(const URL& movieURL) const override { return movieURL == ownMovie; }
    bool isWritingMovie(const URL& movieURL) const override { return recording && movieURL == ownMovie; }
    std::shared_ptr<BroadcastExtensionLink> broadcastExtension() const override { return nullptr; }

    void setBroadcasting(bool isBroadcasting) override {
        note("setBroadcasting");
        broadcasting = isBroadcasting;
    }
    void setSystemRecording(bool isSystemRecording) override {
        note("setSystemRecording");
        systemRecording = isSystemRecording;
    }
    void setContextIDs(std::vector<std::uint32_t> identifiers) override {
        note("setContextIDs");
        contextIDs = std::move(identifiers);
    }
    void setWindowSize(const Size& size) override {
        note("setWindowSize");
        windowSize = size;
    }
    void setDelegate(std::weak_ptr<KVRecordingSessionDelegate> owner) override {
        note("setDelegate");
        delegate = std::move(owner);
    }
    void setCaptureRecording(bool isCapturing) override {
        note("setCaptureRecording");
        capturing = isCapturing;
    }
    void setDaemonUserConsentForMicrophone(bool consent) override { daemonMicrophoneConsent = consent; }
    void setFrontmostPIDForAudioTap(std::int32_t process) override {
        note("setFrontmostPIDForAudioTap");
        tappedProcess = process;
    }
    void setBroadcastConfiguration(std::shared_ptr<const KVBroadcastConfiguration> set) override {
        note("setBroadcastConfiguration");
        broadcastConfiguration = std::move(set);
    }
    OptionalError enableBroadcastWithExtension(const Value& enabled, BroadcastProcessMode mode,
                                               const Dictionary& info,
                                               const std::shared_ptr<IPCEndpoint>& endpoint) override {
        note("enableBroadcast");
        enabledExtension = enabled;
        broadcastProcessMode = mode;
        broadcastUserInfo = info;
        listenerEndpoint = endpoint;
        return broadcastError;
    }
    void disableBroadcast() override { note("disableBroadcast"); }
    void startSessionWithHandler(std::function<void()> completion) override {
        note("startSession");
        start = std::move(completion);
    }
    void resumeSessionWithContextID(std::uint32_t contextID) override {
        note("resumeSession");
        contextIDs = {contextID};
        paused = false;
    }
    void updateProcessIDForAudioCaptureWithPID(std::int32_t process) override {
        note("updateProcessIDForAudioCapture");
        tappedProcess = process;
    }

    void clientApplicationDidEnterBackground() override { note("clientApplicationDidEnterBackground"); }
    void clientApplicationDidEnterForeground() override { note("clientApplicationDidEnterForeground"); }
    void frontmostApplicationDidChange(std::int32_t) override { note("frontmostApplicationDidChange"); }
    void frontmostApplicationWasTerminated(std::int32_t) override {
        note("frontmostApplicationWasTerminated");
    }
    void frontmostApplicationDidEnterBackground(std::int32_t) override {
        note("frontmostApplicationDidEnterBackground");
    }

    void setRecording(bool isRecording) override { recording = isRecording; }
    void setPaused(bool isPaused) override { paused = isPaused; }
    void setExtensionInfo(std::optional<Dictionary> info) override { extension = std::move(info); }
    void setInterruptedMovieURL(std::optional<URL> movieURL) override {
        note("setInterruptedMovieURL");
        interruptedMovie = std::move(movieURL);
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

    /// Capturing has begun.
    void completeStart() { std::exchange(start, nullptr)(); }
    /// Ends the finish that was asked for, with this outcome.
    void completeFinish(const std::optional<URL>& movieURL, const OptionalError& error) {
        std::exchange(finish, nullptr)(movieURL, error);
    }
    /// Ends the clean-up that was asked for.
    void completeCleanup() { std::exchange(cleanup, nullptr)(); }

    std::atomic<bool> recording{false};
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
    std::optional<Dictionary> extension;
    std::optional<URL> interruptedMovie;
    std::optional<URL> ownMovie;

    // What a start set.
    bool capturing = false;
    bool daemonMicrophoneConsent = false;
    std::vector<std::uint32_t> contextIDs;
    Size windowSize;
    std::weak_ptr<KVRecordingSessionDelegate> delegate;
    std::int32_t tappedProcess = 0;
    std::shared_ptr<const KVBroadcastConfiguration> broadcastConfiguration;
    Value enabledExtension;
    BroadcastProcessMode broadcastProcessMode = BroadcastProcessMode::movieClips;
    Dictionary broadcastUserInfo;
    std::shared_ptr<IPCEndpoint> listenerEndpoint;
    /// What enabling the broadcast answers.
    OptionalError broadcastError;

    /// What was asked of the session, in order.
    std::vector<std::string> requests;
    std::vector<Clip> clips;
    /// What waits for `completeStart`, `completeFinish` and `completeCleanup`.
    std::function<void()> start;
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
