#pragma once

#include "platform/AudioService.h"
#include "platform/simulated/SimulatedCaptureSession.h"
#include "platform/simulated/SimulatedClock.h"
#include "platform/simulated/SimulatedInputQueue.h"

#include <map>

namespace kelvo {

/// The process's audio session, which a test interrupts. The handler runs on the test's thread. Thread-safe.
class SimulatedAudioSession : public AudioSession {
  public:
    struct Category {
        AudioSessionCategory category = AudioSessionCategory::playback;
        std::uint32_t options = 0;
    };

    explicit SimulatedAudioSession(std::shared_ptr<SimulatedFaults> faults) : faults_(std::move(faults)) {}

    OptionalError setCategory(AudioSessionCategory category, std::uint32_t options) override {
        if (OptionalError error = faults_->take("AudioSession.setCategory")) return error;
        category_.set({category, options});
        return std::nullopt;
    }
    void setInterruptionHandler(InterruptionHandler handler) override { handler_.set(std::move(handler)); }

    void notify(std::uint64_t type) {
        if (const auto handler = handler_.copy()) handler(type);
    }
    Category category() const { return category_.copy(); }

  private:
    const std::shared_ptr<SimulatedFaults> faults_;
    Guarded<Category> category_;
    Guarded<InterruptionHandler> handler_;
};

/// Sound on the simulated device: a microphone and processes that each play a tone, but only while a test
/// says so with `play`. "AudioService.createInput" and "AudioService.createInputQueue" can be failed.
/// Thread-safe.
class SimulatedAudio : public AudioService {
  public:
    SimulatedAudio(std::shared_ptr<SimulatedClock> clock, std::shared_ptr<SimulatedFaults> faults)
        : session(std::make_shared<SimulatedAudioSession>(faults)),
          orders(std::make_shared<SimulatedCaptureSession::Orders>()),
          clock_(std::move(clock)),
          faults_(std::move(faults)) {}

    std::shared_ptr<AudioSession> audioSession() override { return session; }
    CaptureSessionRef createCaptureSession() override;
    CaptureDeviceRef defaultAudioDevice() override;
    Result<CaptureInputRef> createInput(const CaptureDeviceRef& device) override;
    std::shared_ptr<AudioDataOutput> createAudioDataOutput() override;
    Result<AudioInputQueueRef> createInputQueue(const AudioFormatRecord& format, AudioInputCallback callback,
                                                std::uint32_t flags) override;

    /// What is heard from now on; silence to begin with.
    void setMicrophoneTone(const SimulatedTone& tone) { microphone_.set(tone); }
    void setTone(std::int32_t process, const SimulatedTone& tone);

    /// Captures what was heard in the `duration` before now, through everything that runs.
    void play(std::chrono::nanoseconds duration);

    /// The microphone is taken away, or comes back.
    void interrupt() { session->notify(kAudioInterruptionBegan); }
    void endInterruption() { session->notify(kAudioInterruptionEnded); }

    /// Everything that was made, in order, and the last of it (none before the first).
    std::vector<std::shared_ptr<SimulatedCaptureSession>> captureSessions() const;
    std::vector<std::shared_ptr<SimulatedInputQueue>> inputQueues() const;
    std::shared_ptr<SimulatedCaptureSession> captureSession() const;
    std::shared_ptr<SimulatedInputQueue> inputQueue() const;

    const std::shared_ptr<SimulatedAudioSession> session;
    const std::shared_ptr<SimulatedCaptureSession::Orders> orders;

  private:
    const std::shared_ptr<SimulatedClock> clock_;
    const std::shared_ptr<SimulatedFaults> faults_;
    Guarded<SimulatedTone> microphone_;
    Guarded<std::map<std::int32_t, SimulatedTone>> processes_;
    Guarded<std::vector<std::weak_ptr<SimulatedCaptureSession>>> sessions_;
    Guarded<std::vector<std::weak_ptr<SimulatedInputQueue>>> queues_;
};

}  // namespace kelvo
