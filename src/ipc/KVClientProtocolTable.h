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
    static constexpr Named kTimingData{
        "timingData",
        "72 bytes: duration, presentation and decode time, each a value (64-bit "
        "integer), a time scale (32-bit integer), flags and an epoch"};
    static constexpr std::tuple kMessages{
        Message<&P::updateScreenRecordingState>{
            {"updateScreenRecordingState",
             "The daemon's recording or broadcast state has changed: ask for it."}},
        Message<&P::updateBroadcastServiceInfo>{
            {"updateBroadcastServiceInfo", "The broadcast extension has published information."},
            {Named{"serviceInfo", "the information, as the extension gave it"}}},
        Message<&P::updateBroadcastURL>{
            {"updateBroadcastURL", "The broadcast extension has published an address."},
            {Named{"broadcastURL", "where the broadcast can be watched"}}},
        Message<&P::recordingDidStopWithError>{
            {"recordingDidStopWithError", "A recording or a broadcast has stopped."},
            {Named{"error", "none, or why it stopped"}, Named{"movieURL", "none, or where the movie is"}}},
        Message<&P::recordingLockInterrupted>{
            {"recordingLockInterrupted", "The recording was interrupted because the device was locked."},
            {Named{"error", "what to tell the user"}}},
        Message<&P::recordingShouldResume>{
            {"recordingShouldResume", "The client may go on with its paused recording."}},
        Message<&P::recordingDidPause>{{"recordingDidPause", "The recording was paused."}},
        Message<&P::recordingTimerDidUpdate>{{"recordingTimerDidUpdate", "A tick of the recording's timer."},
                                             {Named{"timerText", "the text to show"}}},
        Message<&P::captureHandlerWithSample>{
            {"captureHandlerWithSample",
             "One captured frame. It is lent: an answer, or the connection's end, gives it back."},
            {Named{"surface", "none, or a memory file with its width, height, bytes a row and pixel format"},
             kTimingData}},
        Message<&P::captureHandlerWithAudioSample>{
            {"captureHandlerWithAudioSample", "Captured sound."},
            {
                Named{"audioData", "the sound"},
                Named{"absdData",
                      "40 bytes of format: sample rate (64-bit float), then as 32-bit integers format, "
                      "flags, bytes a packet, frames a packet, bytes a frame, channels, bits a channel, 0"},
                Named{"itemCount", "how many sample frames the sound has"},
                Named{"bufferType", "2 for the application's sound, 3 for the microphone's"},
                kTimingData,
            }},
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
