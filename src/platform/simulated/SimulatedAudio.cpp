#include "platform/simulated/SimulatedAudio.h"

#include "platform/AudioErrors.h"
#include "platform/QueuedAudioDataOutput.h"

namespace kelvo {
namespace {

class SimulatedCaptureInput : public CaptureInput {};

template <typename Made>
std::vector<std::shared_ptr<Made>> living(const Guarded<std::vector<std::weak_ptr<Made>>>& all) {
    std::vector<std::shared_ptr<Made>> result;
    for (const auto& weak : all.copy()) {
        if (auto made = weak.lock()) result.push_back(std::move(made));
    }
    return result;
}

bool isSupported(const AudioFormatRecord& format) {
    return format.formatIdentifier == kLinearPCMFormat && format.bitsPerChannel == 16 &&
           (format.channelsPerFrame == 1 || format.channelsPerFrame == 2) && format.sampleRate > 0;
}

}  // namespace

CaptureSessionRef SimulatedAudio::createCaptureSession() {
    auto made = std::make_shared<SimulatedCaptureSession>(orders);
    sessions_.with([&](auto& sessions) { sessions.push_back(made); });
    return made;
}

CaptureDeviceRef SimulatedAudio::defaultAudioDevice() {
    return std::make_shared<SimulatedCaptureDevice>();
}

Result<CaptureInputRef> SimulatedAudio::createInput(const CaptureDeviceRef& device) {
    if (OptionalError error = faults_->take("AudioService.createInput")) return *error;
    if (!device) return audioError(kAudioInvalidParameter, "an input on no device");
    return CaptureInputRef(std::make_shared<SimulatedCaptureInput>());
}

std::shared_ptr<AudioDataOutput> SimulatedAudio::createAudioDataOutput() {
    return std::make_shared<QueuedAudioDataOutput>();
}

Result<AudioInputQueueRef> SimulatedAudio::createInputQueue(const AudioFormatRecord& format,
                                                            AudioInputCallback callback,
                                                            std::uint32_t flags) {
    if (OptionalError error = faults_->take("AudioService.createInputQueue")) return *error;
    if (!isSupported(format)) return audioError(kAudioFormatNotSupported, "the format of a tap");
    if ((flags & kAudioQueueTapsProcess) == 0 || !callback) {
        return audioError(kAudioInvalidParameter, "a queue that taps nothing");
    }
    auto made = std::make_shared<SimulatedInputQueue>(format, std::move(callback), faults_);
    queues_.with([&](auto& queues) { queues.push_back(made); });
    return AudioInputQueueRef(made);
}

void SimulatedAudio::setTone(std::int32_t process, const SimulatedTone& tone) {
    processes_.with([&](auto& tones) { tones[process] = tone; });
}

void SimulatedAudio::play(std::chrono::nanoseconds duration) {
    const auto start = clock_->monotonicNow() - duration;
    for (const auto& made : captureSessions())
        made->capture(microphone_.copy(), start, duration);
    const auto tones = processes_.copy();
    for (const auto& queue : inputQueues()) {
        const auto tone = tones.find(queue->process());
        queue->play(tone == tones.end() ? SimulatedTone() : tone->second, start, duration);
    }
}

std::vector<std::shared_ptr<SimulatedCaptureSession>> SimulatedAudio::captureSessions() const {
    return living(sessions_);
}
std::vector<std::shared_ptr<SimulatedInputQueue>> SimulatedAudio::inputQueues() const {
    return living(queues_);
}
std::shared_ptr<SimulatedCaptureSession> SimulatedAudio::captureSession() const {
    const auto all = captureSessions();
    return all.empty() ? nullptr : all.back();
}
std::shared_ptr<SimulatedInputQueue> SimulatedAudio::inputQueue() const {
    const auto all = inputQueues();
    return all.empty() ? nullptr : all.back();
}

}  // namespace kelvo
