#pragma once

#include "base/Guarded.h"
#include "platform/AudioInputQueue.h"

namespace kelvo {

/// The buffers of one audio input queue: which were allocated, and which of them wait to be filled. What the
/// queues of all adapters have in common. Thread-safe; enqueueing and taking allocate nothing.
class AudioQueueBuffers {
  public:
    static constexpr std::uint32_t kLargestBuffer = 1U << 24;

    /// A buffer of 1 to `kLargestBuffer` bytes.
    Result<AudioQueueBufferRef> allocate(std::uint32_t byteSize);
    /// Fails with a strange buffer and with one that waits already.
    OptionalError enqueue(const AudioQueueBufferRef& buffer);
    /// Fails with a strange buffer.
    OptionalError free(const AudioQueueBufferRef& buffer);

    /// The buffer that has waited longest, which waits no more; none when none does.
    AudioQueueBufferRef takeNext();

    std::size_t enqueuedCount() const;
    /// How many are with the queue's user.
    std::size_t lentCount() const;

  private:
    struct Buffers {
        std::vector<AudioQueueBufferRef> allocated;
        std::vector<AudioQueueBufferRef> enqueued;
    };
    Guarded<Buffers> buffers_;
};

}  // namespace kelvo
