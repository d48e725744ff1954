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
    void setClientProxy(ClientProxyRef proxy) { clientProxy_.set(std::move(proxy)); }

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
};

}  // namespace kelvo
