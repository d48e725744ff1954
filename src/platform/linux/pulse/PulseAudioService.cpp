#include "platform/linux/pulse/PulseAudioService.h"

#include "platform/AudioErrors.h"
#include "platform/QueuedAudioDataOutput.h"
#include "platform/linux/pulse/PulseCaptureSession.h"
#include "platform/linux/pulse/PulseInputQueue.h"

#include <utility>

namespace kelvo::pulse {
namespace {

class PulseCaptureInput : public CaptureInput {};

}  // namespace

/// Every program mixes with every other on this system, so that there is nothing to set.
class PulseAudioService::Session : public AudioSession {
  public:
    OptionalError setCategory(AudioSessionCategory, std::uint32_t) override { return std::nullopt; }
    void setInterruptionHandler(InterruptionHandler handler) override { handler_.set(std::move(handler)); }

    void notify(bool isInterrupted) const {
        const auto handler = handler_.copy();
        if (handler) handler(isInterrupted ? kAudioInterruptionBegan : kAudioInterruptionEnded);
    }

  private:
    Guarded<InterruptionHandler> handler_;
};

PulseAudioService::PulseAudioService(std::shared_ptr<Clock> clock)
    : clock_(std::move(clock)), session_(std::make_shared<Session>()) {}

std::function<std::shared_ptr<PulseServer>()> PulseAudioService::serverSource() const {
    return [shared = server_] {
        return shared->with([](std::weak_ptr<PulseServer>& weak) {
            auto server = weak.lock();
            if (!server) weak = server = std::make_shared<PulseServer>();
            return server;
        });
    };
}

std::shared_ptr<AudioSession> PulseAudioService::audioSession() {
    return session_;
}

CaptureSessionRef PulseAudioService::createCaptureSession() {
    return std::make_shared<PulseCaptureSession>(
        serverSource(), clock_, [session = session_](bool isInterrupted) { session->notify(isInterrupted); });
}

CaptureDeviceRef PulseAudioService::defaultAudioDevice() {
    return std::make_shared<PulseCaptureDevice>();
}

Result<CaptureInputRef> PulseAudioService::createInput(const CaptureDeviceRef& device) {
    if (!device) return audioError(kAudioInvalidParameter, "an input on no device");
    return CaptureInputRef(std::make_shared<PulseCaptureInput>());
}

std::shared_ptr<AudioDataOutput> PulseAudioService::createAudioDataOutput() {
    return std::make_shared<QueuedAudioDataOutput>();
}

Result<AudioInputQueueRef> PulseAudioService::createInputQueue(const AudioFormatRecord& format,
                                                               AudioInputCallback callback,
                                                               std::uint32_t flags) {
    if (!PulseInputQueue::isSupported(format)) return audioError(kAudioFormatNotSupported, "a tap's format");
    if ((flags & kAudioQueueTapsProcess) == 0 || !callback) {
        return audioError(kAudioInvalidParameter, "a queue that taps nothing");
    }
    return AudioInputQueueRef(
        std::make_shared<PulseInputQueue>(serverSource(), clock_, format, std::move(callback)));
}

}  // namespace kelvo::pulse
