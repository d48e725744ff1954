#pragma once

#include "base/Clock.h"
#include "base/Guarded.h"
#include "platform/AudioService.h"
#include "platform/linux/pulse/PulseServer.h"

#include <memory>

namespace kelvo::pulse {

/// Sound over the PulseAudio protocol, from whichever server speaks it: the one that the environment and the
/// user's configuration name. Connected only while something is captured. Thread-safe.
class PulseAudioService : public AudioService {
  public:
    explicit PulseAudioService(std::shared_ptr<Clock> clock);

    std::shared_ptr<AudioSession> audioSession() override;
    CaptureSessionRef createCaptureSession() override;
    CaptureDeviceRef defaultAudioDevice() override;
    Result<CaptureInputRef> createInput(const CaptureDeviceRef& device) override;
    std::shared_ptr<AudioDataOutput> createAudioDataOutput() override;
    Result<AudioInputQueueRef> createInputQueue(const AudioFormatRecord& format, AudioInputCallback callback,
                                                std::uint32_t flags) override;

  private:
    class Session;
    using SharedServer = Guarded<std::weak_ptr<PulseServer>>;

    /// The connection that is shared by all who capture.
    std::function<std::shared_ptr<PulseServer>()> serverSource() const;

    const std::shared_ptr<Clock> clock_;
    const std::shared_ptr<Session> session_;
    const std::shared_ptr<SharedServer> server_ = std::make_shared<SharedServer>();
};

}  // namespace kelvo::pulse
