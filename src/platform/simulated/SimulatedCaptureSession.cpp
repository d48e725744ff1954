#include "platform/simulated/SimulatedCaptureSession.h"

#include "platform/QueuedAudioDataOutput.h"

namespace kelvo {

void SimulatedCaptureSession::startRunning() {
    Run expected = Run::stopped;
    if (run_.compare_exchange_strong(expected, Run::starting) && !orders_->runsLate) letRun();
}

void SimulatedCaptureSession::letRun() {
    Run expected = Run::starting;
    if (run_.compare_exchange_strong(expected, Run::running)) notifyObservers(kRunningKeyPath);
}

void SimulatedCaptureSession::stopRunning() {
    if (run_.exchange(Run::stopped) == Run::running) notifyObservers(kRunningKeyPath);
}

void SimulatedCaptureSession::capture(const SimulatedTone& tone, std::chrono::nanoseconds start,
                                      std::chrono::nanoseconds duration) {
    const AudioFormatRecord format = AudioFormatRecord::signed16(44100, 1);
    const std::int64_t frames = frameCount(format, duration);
    const auto isWanted = [weakSelf = weak_from_this()](const CaptureOutputRef& output) {
        const auto self = weakSelf.lock();
        return self && self->yieldsTo(output);
    };
    for (const CaptureOutputRef& output : outputs()) {
        const auto audioOutput = std::dynamic_pointer_cast<QueuedAudioDataOutput>(output);
        if (!audioOutput || !isWanted(output)) continue;
        Bytes bytes(static_cast<std::size_t>(frames) * format.bytesPerFrame);
        writeTone(tone, format, start, frames, bytes.data());
        const TimingRecord timing{MediaTime::make(frames, 44100), MediaTime::make(start.count(), 1000000000),
                                  MediaTime::invalid()};
        audioOutput->deliver(SampleBuffer::audio(format, std::move(bytes), frames, timing),
                             {SimulatedCaptureDevice().name()}, isWanted);
    }
}

}  // namespace kelvo
