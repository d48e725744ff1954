#include "base/KVLog.h"
#include "media/GapSample.h"
#include "media/KVCaptureManager.h"

#include <algorithm>
#include <utility>

namespace kelvo {
namespace {

/// Logs a failure. The start goes on after it, and says so in its texts: whatever failed, the recording is
/// not to wait for its sound.
void check(const OptionalError& error) {
    if (error) KVLogError("KVRecordingManager: startAudioCapture error: %i", static_cast<int>(error->code()));
}

template <typename T>
void check(const Result<T>& result) {
    check(result.optionalError());
}

void logStopFailure(const KVError& error) {
    KVLogError("KVRecordingManager: error: %i", static_cast<int>(error.code()));
}

/// Gives back what the stopped tap's queue holds.
void releaseQueue(const AppAudioTap& tap) {
    for (const AudioQueueBufferRef& buffer : tap.buffers) {
        if (const OptionalError error = tap.queue->freeBuffer(buffer)) {
            logStopFailure(*error);
        } else {
            KVLog("KVRecordingManager: Audio Queue buffer released");
        }
    }
    if (const OptionalError error = tap.queue->dispose()) {
        logStopFailure(*error);
    } else {
        KVLog("KVRecordingManager: Audio Queue has been disposed");
    }
}

/// Room for one second of sound, within bounds.
std::uint32_t bufferByteSize(const AppAudioTap& tap) {
    std::uint32_t packetSize = tap.format.bytesPerPacket;
    if (packetSize == 0) {
        const auto largest = tap.queue->maximumOutputPacketSize();
        check(largest);
        packetSize = largest.valueOr(0);
    }
    constexpr double kSeconds = 1.0;
    const double size = tap.format.sampleRate * packetSize * kSeconds;
    return size > 0 ? static_cast<std::uint32_t>(std::min(size, AppAudioTap::kLargestBufferByteSize)) : 0;
}

/// The buffer's sound as a sample of the packet count that came with it. None when the format or the size
/// makes no sense.
SampleBufferRef sampleFromBuffer(const AudioFormatRecord& format, const AudioQueueBuffer& buffer,
                                 std::uint32_t packetCount, const MediaTime& presentationTime) {
    if (!(format.sampleRate >= 1 && format.sampleRate <= 1e6) || format.formatIdentifier == 0) return nullptr;
    if (buffer.byteSize > buffer.bytes.size()) return nullptr;
    Bytes bytes(buffer.bytes.begin(), buffer.bytes.begin() + static_cast<std::ptrdiff_t>(buffer.byteSize));
    const auto frames = std::int64_t{packetCount} * format.framesPerPacket;
    const TimingRecord timing{MediaTime::make(frames, static_cast<std::int32_t>(format.sampleRate)),
                              presentationTime, MediaTime::invalid()};
    return SampleBuffer::audio(format, std::move(bytes), packetCount, timing);
}

}  // namespace

void KVCaptureManager::startAppAudioCaptureForProcessID(std::int32_t processIdentifier, SampleHandler output,
                                                        DidStartHandler didStart) {
    audioDispatchQueue().async([self = shared_from_this(), processIdentifier, output = std::move(output),
                                didStart = std::move(didStart)]() mutable {
        self->startTap(processIdentifier, std::move(output), std::move(didStart));
    });
}

void KVCaptureManager::resumeAppAudioCaptureForProcessID(std::int32_t processIdentifier,
                                                         SampleHandler output) {
    resumed_ = true;
    startAppAudioCaptureForProcessID(processIdentifier, std::move(output), nullptr);
}

void KVCaptureManager::startTap(std::int32_t processIdentifier, SampleHandler output,
                                DidStartHandler didStart) {
    appAudioOutputHandler_.set(std::move(output));
    const auto tap = std::make_shared<AppAudioTap>();
    audioRecorderQueue_ = tap;
    tap->format = audioBasicDescription_;
    const auto queue = createInputQueue(tap);
    check(queue);
    tap->queue = queue ? *queue : std::make_shared<MissingInputQueue>();
    KVLog("KVRecordingManager: startAudioCapture: Created Audio Queue Input");
    check(tap->queue->setTapProcess(processIdentifier));
    KVLog("KVRecordingManager: startAudioCapture: Successfully set Audio Queue to PID");
    const auto format = tap->queue->streamFormat();
    check(format);
    tap->format = format.valueOr(tap->format);
    allocateBuffers(*tap);
    tap->currentPacket = 0;
    tap->isRunning = true;
    listenToTap(tap);
    check(tap->queue->start());
    KVLog("KVRecordingManager: startAudioCapture: Successfully started Audio Queue Recording");
    appTapDidStartHandler_.set(std::move(didStart));
}

Result<AudioInputQueueRef> KVCaptureManager::createInputQueue(const TapRef& tap) {
    const auto filled = [weakSelf = weak_from_this(), weakTap = std::weak_ptr(tap)](
                            const AudioQueueBufferRef& buffer, const AudioTimeStamp& start,
                            std::uint32_t packetCount, std::span<const AudioPacketDescription> descriptions) {
        const auto self = weakSelf.lock();
        if (!self) return;
        self->inputBufferFilled(weakTap,
                                {buffer, start, packetCount, {descriptions.begin(), descriptions.end()}});
    };
    return audio_->createInputQueue(tap->format, filled, kAudioQueueTapsProcess);
}

void KVCaptureManager::allocateBuffers(AppAudioTap& tap) {
    tap.bufferByteSize = bufferByteSize(tap);
    for (AudioQueueBufferRef& buffer : tap.buffers) {
        const auto allocated = tap.queue->allocateBuffer(tap.bufferByteSize);
        check(allocated);
        buffer = allocated.valueOr(nullptr);
        check(tap.queue->enqueueBuffer(buffer));
    }
}

void KVCaptureManager::listenToTap(const TapRef& tap) {
    check(tap->queue->addRunningListener([weakSelf = weak_from_this(), weakTap = std::weak_ptr(tap)] {
        audioDispatchQueue().async([weakSelf, weakTap] {
            const auto self = weakSelf.lock();
            const auto living = weakTap.lock();
            if (self && living) self->tapRunningStateChanged(living);
        });
    }));
}

/// Fires once a start: the handler stays, the listener goes.
void KVCaptureManager::tapRunningStateChanged(const TapRef& tap) {
    const DidStartHandler didStart = tap->isRunning ? appTapDidStartHandler_.copy() : nullptr;
    if (didStart) didStart();
    static_cast<void>(tap->queue->removeRunningListener());
}

/// On the queue's thread, which must not be held up.
void KVCaptureManager::inputBufferFilled(const std::weak_ptr<AppAudioTap>& weakTap, FilledBuffer filled) {
    // Sound from outside of a recording is dropped, and its buffer with it.
    if (!captureStartTime_.copy().isValid()) return;
    audioDispatchQueue().async([weakSelf = weak_from_this(), weakTap, filled = std::move(filled)] {
        const auto self = weakSelf.lock();
        const auto tap = weakTap.lock();
        if (self && tap && tap == self->audioRecorderQueue_) self->handleInputBuffer(tap, filled);
    });
}

void KVCaptureManager::handleInputBuffer(const TapRef& tap, const FilledBuffer& filled) {
    const MediaTime presentationTime = mediaTimeFromHostTime(filled.start.hostTime);
    if (resumed_.exchange(false)) fillGapAfterResume();
    if (!tap->isRunning) {
        KVLog("recorder is not running, ignoring audio data");
        return;
    }
    std::uint32_t packets = filled.packetCount;
    if (packets == 0 && tap->format.bytesPerPacket != 0) {
        packets = static_cast<std::uint32_t>(filled.buffer->byteSize / tap->format.bytesPerPacket);
    }
    const SampleBufferRef sample =
        sampleFromBuffer(tap->format, *filled.buffer, filled.packetCount, presentationTime);
    if (sample) {
        const auto duration = std::chrono::duration<double>(sample->duration().seconds());
        lastAudioDate_.set(clock_->now() + std::chrono::round<std::chrono::nanoseconds>(duration));
        if (const SampleHandler output = appAudioOutputHandler_.copy()) output(sample);
    }
    tap->currentPacket += packets;
    if (!tap->queue->enqueueBuffer(filled.buffer)) {
        KVLogSample("KVRecordingManager: HandleInputBuffer: Successfully enqueued the audio buffer");
    }
}

/// At time zero, not where the sound is missing: that is how it is meant to be.
void KVCaptureManager::fillGapAfterResume() {
    const std::optional<Date> lastEnd = lastAudioDate_.copy();
    const double gap = lastEnd ? inSeconds(clock_->now() - *lastEnd) : 0;
    if (!(gap > 0)) return;
    KVLog("gap since last audio tap, filling with empty sample buffer");
    const SampleBufferRef silence = makeGapSample(audioBasicDescription_, gap, MediaTime::zero());
    const SampleHandler output = appAudioOutputHandler_.copy();
    if (silence && output) output(silence);
}

void KVCaptureManager::stopAppAudioCapture() {
    onDispatchQueue([this] { stopTap(); });
}

void KVCaptureManager::stopTap() {
    const TapRef tap = std::exchange(audioRecorderQueue_, nullptr);
    if (!tap) return;
    if (tap->isRunning) {
        if (const OptionalError error = tap->queue->stop()) {
            KVLogError("KVRecordingManager:stopAudioCapture:error: %i", static_cast<int>(error->code()));
        } else {
            KVLog("KVRecordingManager:stopAudioCapture: Audio Queue successfully stopped");
            tap->isRunning = false;
            releaseQueue(*tap);
        }
    }
    static_cast<void>(tap->queue->removeRunningListener());
}

}  // namespace kelvo
