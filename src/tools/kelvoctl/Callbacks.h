#pragma once

#include "ipc/KVClientProxyBase.h"

#include <functional>
#include <string>

namespace kelvo::ctl {

/// Turns each callback of the daemon into its name and its arguments by name. Of samples, the numbers are
/// told, not the media. Called on the connection's queue.
class Callbacks : public KVClientProtocol {
  public:
    using Handler = std::function<void(const std::string& name, const Dictionary& arguments)>;
    explicit Callbacks(Handler handler) : handler_(std::move(handler)) {}

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
    const Handler handler_;
};

}  // namespace kelvo::ctl
