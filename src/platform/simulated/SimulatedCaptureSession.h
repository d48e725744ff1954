#pragma once

#include "platform/CaptureSessionParts.h"
#include "platform/simulated/SimulatedSound.h"

#include <atomic>
#include <utility>

namespace kelvo {

/// The simulated microphone. Immutable.
class SimulatedCaptureDevice : public CaptureDevice {
  public:
    std::string name() const override { return "simulated microphone"; }
};

/// A session of the simulated device. It runs at once, or when the test lets it. Observers are told on the
/// thread that makes it run. Thread-safe.
class SimulatedCaptureSession : public CaptureSessionParts,
                                public std::enable_shared_from_this<SimulatedCaptureSession> {
  public:
    /// What a test ordered for the sessions of its device.
    struct Orders {
        std::atomic<bool> runsLate{false};        ///< `startRunning` waits for `letRun`
        std::atomic<bool> refusesInputs{false};   ///< no input can be added
        std::atomic<bool> refusesOutputs{false};  ///< no output can be added
    };

    explicit SimulatedCaptureSession(std::shared_ptr<const Orders> orders) : orders_(std::move(orders)) {}

    bool canAddInput(const CaptureInputRef& input) override {
        return !orders_->refusesInputs && CaptureSessionParts::canAddInput(input);
    }
    bool canAddOutput(const CaptureOutputRef& output) override {
        return !orders_->refusesOutputs && CaptureSessionParts::canAddOutput(output);
    }
    void setUsesApplicationAudioSession(bool uses) override { usesApplicationSession_ = uses; }
    void setAutomaticallyConfiguresApplicationAudioSession(bool configures) override {
        configuresApplicationSession_ = configures;
    }
    void startRunning() override;
    void stopRunning() override;
    bool isRunning() override { return run_ == Run::running; }

    /// Makes a start that waits happen.
    void letRun();

    /// Captures the microphone's sound from `start` on, `duration` long, when it is there to be captured.
    void capture(const SimulatedTone& tone, std::chrono::nanoseconds start,
                 std::chrono::nanoseconds duration);

    bool usesApplicationSession() const { return usesApplicationSession_; }
    bool configuresApplicationSession() const { return configuresApplicationSession_; }

  private:
    enum class Run { stopped, starting, running };

    const std::shared_ptr<const Orders> orders_;
    std::atomic<bool> usesApplicationSession_{false};
    std::atomic<bool> configuresApplicationSession_{true};
    std::atomic<Run> run_{Run::stopped};
};

}  // namespace kelvo
