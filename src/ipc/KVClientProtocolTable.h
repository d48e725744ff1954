#pragma once

#include "base/KVLog.h"
#include "ipc/KVClientProxyBase.h"
#include "ipc/ProtocolTable.h"

namespace kelvo {

/// The table of the callbacks. Their order is no part of the wire.
template <>
struct ProtocolTable<KVClientProtocol> {
    using P = KVClientProtocol;
    static constexpr std::string_view kName = "com.quillon.KelvoKit.KVClientProtocol";
    static constexpr std::tuple kMessages{
        Message<&P::updateScreenRecordingState>{"updateScreenRecordingState"},
        Message<&P::updateBroadcastServiceInfo>{"updateBroadcastServiceInfo", {"serviceInfo"}},
        Message<&P::updateBroadcastURL>{"updateBroadcastURL", {"broadcastURL"}},
        Message<&P::recordingDidStopWithError>{"recordingDidStopWithError", {"error", "movieURL"}},
        Message<&P::recordingLockInterrupted>{"recordingLockInterrupted", {"error"}},
        Message<&P::recordingShouldResume>{"recordingShouldResume"},
        Message<&P::recordingDidPause>{"recordingDidPause"},
        Message<&P::recordingTimerDidUpdate>{"recordingTimerDidUpdate", {"timerText"}},
        Message<&P::captureHandlerWithSample>{"captureHandlerWithSample", {"surface", "timingData"}},
        Message<&P::captureHandlerWithAudioSample>{
            "captureHandlerWithAudioSample",
            {"audioData", "absdData", "itemCount", "bufferType", "timingData"}},
    };
};

/// Sends callbacks over one connection; what cannot be delivered goes to the error handler. Thread-safe.
class RemoteClient : public KVClientProtocol {
  public:
    using P = KVClientProtocol;
    RemoteClient(IPCConnection& connection, std::function<void(const KVError&)> errorHandler)
        : sender_(connection, std::move(errorHandler)) {}

    void updateScreenRecordingState() override { sender_.send<&P::updateScreenRecordingState>(); }
    void updateBroadcastServiceInfo(const Dictionary& serviceInfo) override {
        sender_.send<&P::updateBroadcastServiceInfo>(serviceInfo);
    }
    void updateBroadcastURL(const URL& broadcastURL) override {
        sender_.send<&P::updateBroadcastURL>(broadcastURL);
    }
    void recordingDidStopWithError(const OptionalError& error, const std::optional<URL>& movieURL) override {
        sender_.send<&P::recordingDidStopWithError>(error, movieURL);
    }
    void recordingLockInterrupted(const KVError& error) override {
        sender_.send<&P::recordingLockInterrupted>(error);
    }
    void recordingShouldResume() override { sender_.send<&P::recordingShouldResume>(); }
    void recordingDidPause() override { sender_.send<&P::recordingDidPause>(); }
    void recordingTimerDidUpdate(const std::string& timerText) override {
        sender_.send<&P::recordingTimerDidUpdate>(timerText);
    }
    void captureHandlerWithSample(const std::shared_ptr<KVIOSurfaceObject>& surface,
                                  const RecordBytes<TimingRecord>& timingData) override {
        sender_.send<&P::captureHandlerWithSample>(surface, timingData);
    }
    void captureHandlerWithAudioSample(std::span<const std::byte> audioData,
                                       const RecordBytes<AudioFormatRecord>& absdData, std::int64_t itemCount,
                                       SampleBuffer::Type bufferType,
                                       const RecordBytes<TimingRecord>& timingData) override {
        sender_.send<&P::captureHandlerWithAudioSample>(audioData, absdData, itemCount, bufferType,
                                                        timingData);
    }

  private:
    const RemoteSender sender_;
};

/// The client at the other end of a connection. A delivery that fails is logged as `failureText` and the
/// error's code, and forgotten.
inline RemoteClient remoteClient(IPCConnection& connection, const char* failureText) {
    return {connection, [failureText](const KVError& error) {
                KVLogError("%s: %d", failureText, static_cast<int>(error.code()));
            }};
}

}  // namespace kelvo
