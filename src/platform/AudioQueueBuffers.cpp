#include "platform/AudioQueueBuffers.h"

#include "platform/AudioErrors.h"

#include <algorithm>

namespace kelvo {
namespace {

bool contains(const std::vector<AudioQueueBufferRef>& buffers, const AudioQueueBufferRef& buffer) {
    return std::ranges::find(buffers, buffer) != buffers.end();
}

}  // namespace

Result<AudioQueueBufferRef> AudioQueueBuffers::allocate(std::uint32_t byteSize) {
    if (byteSize == 0 || byteSize > kLargestBuffer) {
        return audioError(kAudioInvalidParameter, "a buffer of " + std::to_string(byteSize) + " bytes");
    }
    auto buffer = std::make_shared<AudioQueueBuffer>();
    buffer->bytes.resize(byteSize);
    buffers_.with([&](Buffers& buffers) {
        buffers.allocated.push_back(buffer);
        buffers.enqueued.reserve(buffers.allocated.size());
    });
    return buffer;
}

OptionalError AudioQueueBuffers::enqueue(const AudioQueueBufferRef& buffer) {
    return buffers_.with([&](Buffers& buffers) -> OptionalError {
        if (!contains(buffers.allocated, buffer) || contains(buffers.enqueued, buffer)) {
            return audioError(kAudioInvalidBuffer, "enqueue a buffer that is not the user's");
        }
        buffers.enqueued.push_back(buffer);
        return std::nullopt;
    });
}

OptionalError AudioQueueBuffers::free(const AudioQueueBufferRef& buffer) {
    return buffers_.with([&](Buffers& buffers) -> OptionalError {
        std::erase(buffers.enqueued, buffer);
        if (std::erase(buffers.allocated, buffer) > 0) return std::nullopt;
        return audioError(kAudioInvalidBuffer, "free a buffer that is not the queue's");
    });
}

AudioQueueBufferRef AudioQueueBuffers::takeNext() {
    return buffers_.with([](Buffers& buffers) -> AudioQueueBufferRef {
        if (buffers.enqueued.empty()) return nullptr;
        AudioQueueBufferRef next = std::move(buffers.enqueued.front());
        buffers.enqueued.erase(buffers.enqueued.begin());
        return next;
    });
}

std::size_t AudioQueueBuffers::enqueuedCount() const {
    return buffers_.with([](const Buffers& buffers) { return buffers.enqueued.size(); });
}

std::size_t AudioQueueBuffers::lentCount() const {
    return buffers_.with(
        [](const Buffers& buffers) { return buffers.allocated.size() - buffers.enqueued.size(); });
}

}  // namespace kelvo
