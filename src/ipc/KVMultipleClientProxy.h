#pragma once

#include "ipc/KVClientProxyBase.h"
#include "platform/IPC.h"

#include <atomic>
#include <cstdint>
#include <memory>
#include <mutex>
#include <vector>

namespace kelvo {

/// All privileged clients at once. Every one of them hears what concerns the system's recording; what belongs
/// to a single application's broadcast or capture is dropped. Thread-safe.
///
/// The set of connections only grows: a connection that is over stays in it, and sending to it fails and is
/// logged.
class KVMultipleClientProxy : public KVClientProxyBase {
  public:
    /// The process's shared instance, made on first use and kept for good.
    static const std::shared_ptr<KVMultipleClientProxy>& clientProxy();

    /// Adds a connection; one that is there already is not added again.
    void handleNewConnection(const IPCConnectionRef& connection);
    /// In the order in which they were added.
    std::vector<IPCConnectionRef> connectionSet() const;

    /// Whose request came last; 0 before the first.
    std::int32_t currentConnectionProcessIdentifier() const { return currentConnectionProcessIdentifier_; }
    void setCurrentConnectionProcessIdentifier(std::int32_t processIdentifier) {
        currentConnectionProcessIdentifier_ = processIdentifier;
    }

    /// Ends the process's connections without their handlers running.
    void resetConnectionWithProcessIdentifier(std::int32_t processIdentifier) override;

    /// Tells everyone but the client that caused the change; nobody while there is one client alone.
    void updateScreenRecordingState() override;
    void updateBroadcastURL(const URL& broadcastURL) override;
    void recordingDidStopWithError(const OptionalError& error, const std::optional<URL>& movieURL) override;
    void recordingLockInterrupted(const KVError& error) override;
    void recordingTimerDidUpdate(const std::string& timerText) override;

    // Dropped.
    void updateBroadcastServiceInfo(const Dictionary&) override {}
    void captureHandlerWithSample(const std::shared_ptr<KVIOSurfaceObject>&,
                                  const RecordBytes<TimingRecord>&) override {}
    void captureHandlerWithAudioSample(std::span<const std::byte>, const RecordBytes<AudioFormatRecord>&,
                                       std::int64_t, SampleBuffer::Type,
                                       const RecordBytes<TimingRecord>&) override {}
    // Not offered: the system's recording is not paused. Sending one is a bug of the sender, and is logged.
    void recordingShouldResume() override;
    void recordingDidPause() override;

  private:
    template <typename Send>
    void sendToEveryone(const char* failureText, Send send);

    mutable std::mutex lock_;  // held while a fan-out walks the set
    std::vector<IPCConnectionRef> connectionSet_;
    std::atomic<std::int32_t> currentConnectionProcessIdentifier_{0};
};

}  // namespace kelvo
