#include "platform/linux/pulse/PulseInputQueue.h"

#include "platform/AudioErrors.h"

#include <algorithm>
#include <utility>

namespace kelvo::pulse {
namespace {

/// How often silence is looked for, of which nobody tells. A little longer than a buffer, so that buffers
/// that are filled with sound need no other look.
constexpr std::chrono::milliseconds kTickInterval{50};

std::uint32_t rateOf(const AudioFormatRecord& format) {
    return static_cast<std::uint32_t>(format.sampleRate);
}

bool isBigEndian(const AudioFormatRecord& format) {
    return (format.formatFlags & kAudioFlagBigEndian) != 0;
}

}  // namespace

bool PulseInputQueue::isSupported(const AudioFormatRecord& format) {
    AudioFormatRecord supported = AudioFormatRecord::signed16(format.sampleRate, format.channelsPerFrame);
    supported.formatFlags |= format.formatFlags & kAudioFlagBigEndian;
    return format == supported && (format.channelsPerFrame == 1 || format.channelsPerFrame == 2) &&
           format.sampleRate >= 8000 && format.sampleRate <= 192000;
}

PulseInputQueue::PulseInputQueue(ServerSource server, std::shared_ptr<Clock> clock,
                                 const AudioFormatRecord& format, AudioInputCallback callback)
    : server_(std::move(server)),
      clock_(std::move(clock)),
      format_(format),
      callback_(std::move(callback)),
      lost_(static_cast<std::size_t>(kFramesInBuffer) * format.bytesPerFrame) {}

PulseInputQueue::~PulseInputQueue() = default;

PulseInputQueue::Run::Run(PulseInputQueue& queue, const RecordStream::Source& format)
    : timeline(queue.clock_->monotonicNow(), format.rate, format.channels),
      ticker("kelvo.tap", kTickInterval, [this, &queue] { queue.fillBuffers(timeline); }),
      tap(queue.server_(), queue.clock_, queue.processIdentifier_, format, timeline, [this, &queue] {
          if (queue.canFillBuffer(timeline)) ticker.wake();
      }) {}

OptionalError PulseInputQueue::unlessDisposed(const char* operation) const {
    return isDisposed_ ? OptionalError(audioError(kAudioInvalidRunState, operation)) : std::nullopt;
}

OptionalError PulseInputQueue::setTapProcess(std::int32_t processIdentifier) {
    if (OptionalError error = unlessDisposed("setTapProcess")) return error;
    if (processIdentifier < 1) return audioError(kAudioInvalidParameter, "tap no process");
    const std::lock_guard lock(control_);
    if (run_) return audioError(kAudioInvalidRunState, "tap another process");
    processIdentifier_ = processIdentifier;
    return std::nullopt;
}

Result<AudioFormatRecord> PulseInputQueue::streamFormat() {
    if (OptionalError error = unlessDisposed("streamFormat")) return *error;
    return format_;
}

Result<std::uint32_t> PulseInputQueue::maximumOutputPacketSize() {
    if (OptionalError error = unlessDisposed("maximumOutputPacketSize")) return *error;
    return format_.bytesPerPacket;
}

Result<AudioQueueBufferRef> PulseInputQueue::allocateBuffer(std::uint32_t byteSize) {
    if (OptionalError error = unlessDisposed("allocateBuffer")) return *error;
    return buffers_.allocate(byteSize);
}

OptionalError PulseInputQueue::enqueueBuffer(const AudioQueueBufferRef& buffer) {
    if (OptionalError error = unlessDisposed("enqueueBuffer")) return error;
    return buffers_.enqueue(buffer);
}

OptionalError PulseInputQueue::freeBuffer(const AudioQueueBufferRef& buffer) {
    if (OptionalError error = unlessDisposed("freeBuffer")) return error;
    return buffers_.free(buffer);
}

OptionalError PulseInputQueue::start() {
    if (OptionalError error = unlessDisposed("start")) return error;
    {
        const std::lock_guard lock(control_);
        if (run_ || processIdentifier_ == 0) return audioError(kAudioInvalidRunState, "start");
        run_ = std::make_unique<Run>(
            *this, RecordStream::Source{.sinkInput = std::nullopt,
                                        .rate = rateOf(format_),
                                        .channels = static_cast<std::uint8_t>(format_.channelsPerFrame)});
    }
    runningChanged();
    return std::nullopt;
}

OptionalError PulseInputQueue::stop() {
    if (OptionalError error = unlessDisposed("stop")) return error;
    endRun();
    return std::nullopt;
}

OptionalError PulseInputQueue::dispose() {
    if (isDisposed_.exchange(true)) return audioError(kAudioInvalidRunState, "dispose");
    endRun();
    listener_.set(nullptr);
    return std::nullopt;
}

void PulseInputQueue::endRun() {
    std::unique_ptr<Run> run;
    {
        const std::lock_guard lock(control_);
        run = std::move(run_);
    }
    if (!run) return;
    run.reset();
    runningChanged();
}

OptionalError PulseInputQueue::addRunningListener(std::function<void()> listener) {
    if (OptionalError error = unlessDisposed("addRunningListener")) return error;
    listener_.set(std::move(listener));
    return std::nullopt;
}

OptionalError PulseInputQueue::removeRunningListener() {
    if (OptionalError error = unlessDisposed("removeRunningListener")) return error;
    if (listener_.exchange(nullptr)) return std::nullopt;
    return audioError(kAudioInvalidParameter, "remove a listener that is not there");
}

void PulseInputQueue::runningChanged() const {
    if (const auto listener = listener_.copy()) listener();
}

bool PulseInputQueue::canFillBuffer(const MixTimeline& timeline) const {
    return timeline.readableFrames(clock_->monotonicNow()) >= framesInNextBuffer();
}

void PulseInputQueue::fillBuffers(MixTimeline& timeline) {
    std::int64_t frames = framesInNextBuffer();
    while (timeline.readableFrames(clock_->monotonicNow()) >= frames) {
        if (const AudioQueueBufferRef buffer = buffers_.takeNext()) {
            fill(timeline, buffer, frames);
        } else {
            timeline.read(lost_, isBigEndian(format_));
        }
        frames = framesInNextBuffer();
    }
}

std::int64_t PulseInputQueue::framesInNextBuffer() const {
    if (buffers_.enqueuedCount() == 0) return kFramesInBuffer;
    std::int64_t frames = kFramesInBuffer;
    for (std::size_t i = buffers_.lentCount(); i > 0 && frames < kMostFramesInBuffer; --i)
        frames *= 2;
    return std::min(frames, kMostFramesInBuffer);
}

void PulseInputQueue::fill(MixTimeline& timeline, const AudioQueueBufferRef& buffer, std::int64_t frames) {
    frames = std::min(frames, static_cast<std::int64_t>(buffer->bytes.size() / format_.bytesPerFrame));
    AudioTimeStamp start;
    start.sampleTime = static_cast<double>(timeline.framesRead());
    start.hostTime = static_cast<std::uint64_t>(timeline.position().count());
    start.flags = kAudioSampleTimeValid | kAudioHostTimeValid;
    buffer->byteSize = static_cast<std::size_t>(frames) * format_.bytesPerFrame;
    timeline.read({buffer->bytes.data(), buffer->byteSize}, isBigEndian(format_));
    callback_(buffer, start, static_cast<std::uint32_t>(frames), {});
}

}  // namespace kelvo::pulse
