#include "platform/simulated/SimulatedInputQueue.h"

#include "platform/AudioErrors.h"

#include <algorithm>

namespace kelvo {

OptionalError SimulatedInputQueue::refusal(const char* operation) {
    if (OptionalError fault = faults_->take(std::string("AudioInputQueue.") + operation)) return fault;
    if (isDisposed()) return audioError(kAudioInvalidRunState, operation);
    return std::nullopt;
}

OptionalError SimulatedInputQueue::setTapProcess(std::int32_t processIdentifier) {
    if (OptionalError error = refusal("setTapProcess")) return error;
    if (processIdentifier < 1) return audioError(kAudioInvalidParameter, "tap no process");
    return state_.with([&](State& state) -> OptionalError {
        if (state.run == Run::running) return audioError(kAudioInvalidRunState, "tap another process");
        state.process = processIdentifier;
        return std::nullopt;
    });
}

Result<AudioFormatRecord> SimulatedInputQueue::streamFormat() {
    if (OptionalError error = refusal("streamFormat")) return *error;
    return format_.copy();
}

Result<std::uint32_t> SimulatedInputQueue::maximumOutputPacketSize() {
    if (OptionalError error = refusal("maximumOutputPacketSize")) return *error;
    return format_.copy().channelsPerFrame * 2;
}

Result<AudioQueueBufferRef> SimulatedInputQueue::allocateBuffer(std::uint32_t byteSize) {
    if (OptionalError error = refusal("allocateBuffer")) return *error;
    return buffers_.allocate(byteSize);
}

OptionalError SimulatedInputQueue::enqueueBuffer(const AudioQueueBufferRef& buffer) {
    if (OptionalError error = refusal("enqueueBuffer")) return error;
    return buffers_.enqueue(buffer);
}

OptionalError SimulatedInputQueue::freeBuffer(const AudioQueueBufferRef& buffer) {
    if (OptionalError error = refusal("freeBuffer")) return error;
    return buffers_.free(buffer);
}

OptionalError SimulatedInputQueue::start() {
    if (OptionalError error = refusal("start")) return error;
    const bool starts = state_.with([](State& state) {
        if (state.run == Run::running || state.process == 0) return false;
        state.run = Run::running;
        return true;
    });
    if (!starts) return audioError(kAudioInvalidRunState, "start");
    notifyRunning();
    return std::nullopt;
}

OptionalError SimulatedInputQueue::stop() {
    if (OptionalError error = refusal("stop")) return error;
    const bool wasRunning =
        state_.with([](State& state) { return std::exchange(state.run, Run::stopped) == Run::running; });
    std::lock_guard lock(filling_);
    if (wasRunning) notifyRunning();
    return std::nullopt;
}

OptionalError SimulatedInputQueue::dispose() {
    if (OptionalError error = refusal("dispose")) return error;
    state_.with([](State& state) { state.run = Run::disposed; });
    std::lock_guard lock(filling_);
    return std::nullopt;
}

OptionalError SimulatedInputQueue::addRunningListener(std::function<void()> listener) {
    if (OptionalError error = refusal("addRunningListener")) return error;
    listener_.set(std::move(listener));
    return std::nullopt;
}

OptionalError SimulatedInputQueue::removeRunningListener() {
    if (OptionalError error = refusal("removeRunningListener")) return error;
    if (listener_.exchange(nullptr)) return std::nullopt;
    return audioError(kAudioInvalidParameter, "remove a listener that is not there");
}

void SimulatedInputQueue::notifyRunning() {
    if (const auto listener = listener_.copy()) listener();
}

void SimulatedInputQueue::play(const SimulatedTone& tone, std::chrono::nanoseconds start,
                               std::chrono::nanoseconds duration) {
    const AudioFormatRecord format = format_.copy();
    std::int64_t left = frameCount(format, duration);
    const std::lock_guard lock(filling_);
    while (left > 0 && isRunning()) {
        const AudioQueueBufferRef buffer = buffers_.takeNext();
        const auto fits =
            buffer ? static_cast<std::int64_t>(buffer->bytes.size()) / format.bytesPerFrame : kFramesInBuffer;
        const std::int64_t frames = std::min({left, fits, kFramesInBuffer});
        if (buffer) {
            writeTone(tone, format, start, frames, buffer->bytes.data());
            buffer->byteSize = static_cast<std::size_t>(frames) * format.bytesPerFrame;
            callBack(buffer, start, static_cast<std::uint32_t>(frames));
        }
        start +=
            std::chrono::nanoseconds(std::llround(static_cast<double>(frames) * 1e9 / format.sampleRate));
        left -= frames;
        state_.with([&](State& state) { state.sampleTime += static_cast<double>(frames); });
    }
}

void SimulatedInputQueue::fillNextBuffer(const Bytes& content, std::chrono::nanoseconds start,
                                         std::uint32_t packetCount) {
    const std::lock_guard lock(filling_);
    const AudioQueueBufferRef buffer = isRunning() ? buffers_.takeNext() : nullptr;
    if (!buffer) return;
    buffer->byteSize = std::min(content.size(), buffer->bytes.size());
    std::copy_n(content.begin(), buffer->byteSize, buffer->bytes.begin());
    callBack(buffer, start, packetCount);
}

void SimulatedInputQueue::callBack(const AudioQueueBufferRef& buffer, std::chrono::nanoseconds start,
                                   std::uint32_t packetCount) {
    AudioTimeStamp timeStamp;
    timeStamp.sampleTime = state_.copy().sampleTime;
    timeStamp.hostTime = static_cast<std::uint64_t>(start.count());
    timeStamp.flags = kAudioSampleTimeValid | kAudioHostTimeValid;
    callback_(buffer, timeStamp, packetCount, {});
}

}  // namespace kelvo
