#pragma once

#include "base/Guarded.h"
#include "session/RecordingSession.h"

#include <atomic>
#include <optional>
#include <string>

namespace kelvo {

/// A session that cannot record yet, and so stays idle: it keeps what its managers note on it, finishing does
/// nothing because nothing runs, and cleaning up has no file to remove. Thread-safe.
class KVRecordingSession : public RecordingSession {
  public:
    explicit KVRecordingSession(std::string bundleID) : bundleID_(std::move(bundleID)) {}

    std::string bundleID() const override { return bundleID_; }
    bool isRecording() const override { return false; }
    bool isBroadcasting() const override { return false; }
    bool isSystemRecording() const override { return false; }
    ClientProxyRef clientProxy() const override { return clientProxy_.copy(); }
    void setClientProxy(ClientProxyRef proxy) override { clientProxy_.set(std::move(proxy)); }

    bool isPaused() const override { return false; }
    bool microphoneEnabled() const override { return microphoneEnabled_; }
    void setMicrophoneEnabled(bool enabled) override { microphoneEnabled_ = enabled; }
    bool microphoneEnabledPersistent() const override { return microphoneEnabledPersistent_; }
    void setMicrophoneEnabledPersistent(bool enabled) override { microphoneEnabledPersistent_ = enabled; }
    bool hasUserConsentForCamera() const override { return hasUserConsentForCamera_; }
    void setHasUserConsentForCamera(bool consent) override { hasUserConsentForCamera_ = consent; }
    bool hasUserConsentForMicrophone() const override { return hasUserConsentForMicrophone_; }
    void setHasUserConsentForMicrophone(bool consent) override { hasUserConsentForMicrophone_ = consent; }
    void pauseSession() override {}

    void setRecording(bool) override {}
    void setPaused(bool) override {}
    void setExtensionInfo(std::optional<Dictionary>) override {}
    void setInterruptedMovieURL(std::optional<URL>) override {}
    void finishSessionWithHandler(MovieHandler) override {}
    void finishSessionWithStartClipDuration(double, double, MovieHandler) override {}
    void finishAndCleanupSessionFilesWithHandler(std::function<void()> completion) override {
        if (completion) completion();
    }
    void notifyRecordingMayBeStopped() override {}
    void notifyRecordingResumed() override {}

  private:
    const std::string bundleID_;
    Guarded<ClientProxyRef> clientProxy_;
    std::atomic<bool> microphoneEnabled_{false};
    std::atomic<bool> microphoneEnabledPersistent_{false};
    std::atomic<bool> hasUserConsentForCamera_{false};
    std::atomic<bool> hasUserConsentForMicrophone_{false};
};

}  // namespace kelvo
