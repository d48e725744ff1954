#include "platform/linux/pulse/PulseCaptureSession.h"

#include "base/GlobalQueue.h"
#include "platform/QueuedAudioDataOutput.h"

#include <cstring>
#include <utility>

namespace kelvo::pulse {

PulseCaptureSession::PulseCaptureSession(ServerSource server, std::shared_ptr<Clock> clock,
                                         InterruptionHandler interrupted)
    : server_(std::move(server)), clock_(std::move(clock)), interruptionHandler_(std::move(interrupted)) {}

PulseCaptureSession::~PulseCaptureSession() = default;

void PulseCaptureSession::startRunning() {
    if (isRunning_.exchange(true)) return;
    openOrClose();
    runningChanged();
}

void PulseCaptureSession::stopRunning() {
    if (!isRunning_.exchange(false)) return;
    openOrClose();
    runningChanged();
}

void PulseCaptureSession::partsChanged() {
    openOrClose();
}

void PulseCaptureSession::openOrClose() {
    const std::lock_guard lock(control_);
    const bool isWanted = isRunning_ && inputCount() > 0 && outputCount() > 0;
    if (!isWanted) {
        microphone_.reset();
    } else if (!microphone_) {
        const PulseMicrophone::Handlers handlers{
            [this](std::chrono::nanoseconds moment, std::span<const std::int16_t> samples) {
                recorded(moment, samples);
            },
            [this](bool isInterrupted) { interrupted(isInterrupted); }};
        microphone_ = std::make_unique<PulseMicrophone>(server_(), clock_, handlers);
    }
}

/// Not on the caller's thread, which may be in the middle of its own start.
void PulseCaptureSession::runningChanged() {
    GlobalQueue::get(QueuePriority::high).async([weakSelf = weak_from_this()] {
        if (const auto self = weakSelf.lock()) self->notifyObservers(kRunningKeyPath);
    });
}

/// Behind the samples that were recorded before: the first sample after it must be the first one after the
/// gap.
void PulseCaptureSession::interrupted(bool isInterrupted) {
    for (const CaptureOutputRef& output : outputs()) {
        const auto audioOutput = std::dynamic_pointer_cast<QueuedAudioDataOutput>(output);
        if (!audioOutput) continue;
        audioOutput->afterSamples(
            [handler = interruptionHandler_, isInterrupted] { handler(isInterrupted); });
        return;
    }
}

void PulseCaptureSession::recorded(std::chrono::nanoseconds moment, std::span<const std::int16_t> samples) {
    const AudioFormatRecord format = AudioFormatRecord::signed16(PulseMicrophone::kRate, 1);
    const auto frames = static_cast<std::int64_t>(samples.size());
    const TimingRecord timing{MediaTime::make(frames, PulseMicrophone::kRate),
                              MediaTime::make(moment.count(), 1000000000), MediaTime::invalid()};
    Bytes bytes(samples.size_bytes());
    std::memcpy(bytes.data(), samples.data(), bytes.size());
    const auto sample = SampleBuffer::audio(format, std::move(bytes), frames, timing);
    const auto isWanted = [weakSelf = weak_from_this()](const CaptureOutputRef& output) {
        const auto self = weakSelf.lock();
        return self && self->yieldsTo(output);
    };
    for (const CaptureOutputRef& output : outputs()) {
        if (const auto audioOutput = std::dynamic_pointer_cast<QueuedAudioDataOutput>(output))
            audioOutput->deliver(sample, {PulseCaptureDevice().name()}, isWanted);
    }
}

}  // namespace kelvo::pulse
