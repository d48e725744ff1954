#pragma once

#include "base/Guarded.h"
#include "ipc/KVClientProxyBase.h"
#include "platform/IPC.h"

namespace kelvo {

/// One ordinary client application, through its own connection, which ends when this object goes.
/// Thread-safe.
class KVClientProxy : public KVClientProxyBase {
  public:
    explicit KVClientProxy(IPCConnectionRef connection) : connection_(std::move(connection)) {}
    ~KVClientProxy() override;
    KVClientProxy(const KVClientProxy&) = delete;
    KVClientProxy& operator=(const KVClientProxy&) = delete;

    IPCConnectionRef connection() const { return connection_.copy(); }
    void setConnection(IPCConnectionRef connection) { connection_.set(std::move(connection)); }

    std::int32_t processIdentifier() const override;

    /// Only logs: an application knows the state of its own recording.
    void updateScreenRecordingState() override;
    void updateBroadcastServiceInfo(const Dictionary& serviceInfo) override;
    void updateBroadcastURL(const URL& broadcastURL) override;
    void recordingDidStopWithError(const OptionalError& error, const std::optional<URL>& movieURL) override;
    void recordingLockInterrupted(const KVError& error) override;
    void recordingShouldResume() override;
    void recordingDidPause() override;
    void recordingTimerDidUpdate(const std::string& timerText) override;
    void captureHandlerWithSample(const std::shared_ptr<KVIOSurfaceObject>& surface,
                                  const RecordBytes<TimingRecord>& timingData) override;
    void captureHandlerWithAudioSample(std::span<const std::byte> audioData,
                                       const RecordBytes<AudioFormatRecord>& absdData, std::int64_t itemCount,
                                       SampleBuffer::Type bufferType,
                                       const RecordBytes<TimingRecord>& timingData) override;

  private:
    Guarded<IPCConnectionRef> connection_;
};

}  // namespace kelvo
