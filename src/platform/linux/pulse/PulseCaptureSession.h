#pragma once

#include "platform/CaptureSessionParts.h"
#include "platform/linux/pulse/PulseMicrophone.h"

#include <atomic>
#include <functional>
#include <memory>
#include <mutex>

namespace kelvo::pulse {

/// The user's preferred source, whichever that is. Immutable.
class PulseCaptureDevice : public CaptureDevice {
  public:
    std::string name() const override { return "default source"; }
};

/// The microphone as a capture session. It holds a stream of the sound server only while it runs and has an
/// input and an output. Observers of its running are told on a global queue. Thread-safe.
class PulseCaptureSession : public CaptureSessionParts,
                            public std::enable_shared_from_this<PulseCaptureSession> {
  public:
    using ServerSource = std::function<std::shared_ptr<PulseServer>()>;
    using InterruptionHandler = std::function<void(bool isInterrupted)>;

    /// `interrupted` runs on the queue of an output's delegate, behind the samples that came before.
    PulseCaptureSession(ServerSource server, std::shared_ptr<Clock> clock, InterruptionHandler interrupted);
    ~PulseCaptureSession() override;

    /// There is one audio session, and it needs no configuration.
    void setUsesApplicationAudioSession(bool) override {}
    void setAutomaticallyConfiguresApplicationAudioSession(bool) override {}

    void startRunning() override;
    void stopRunning() override;
    bool isRunning() override { return isRunning_; }

  private:
    void partsChanged() override;
    void openOrClose();
    void runningChanged();
    void interrupted(bool isInterrupted);
    void recorded(std::chrono::nanoseconds moment, std::span<const std::int16_t> samples);

    const ServerSource server_;
    const std::shared_ptr<Clock> clock_;
    const InterruptionHandler interruptionHandler_;
    std::atomic<bool> isRunning_{false};
    /// Held while the microphone is opened or closed, never by the threads that it calls on.
    std::mutex control_;
    std::unique_ptr<PulseMicrophone> microphone_;
};

}  // namespace kelvo::pulse
