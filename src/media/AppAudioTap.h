#pragma once

#include "platform/AudioInputQueue.h"

#include <array>
#include <cstdint>

namespace kelvo {

/// The state of one running tap. Bound to the capture manager's dispatch queue.
struct AppAudioTap {
    static constexpr std::size_t kBufferCount = 10;
    static constexpr double kLargestBufferByteSize = 57344.0;

    /// Never none: in place of a queue that could not be made stands one that can do nothing.
    AudioInputQueueRef queue;
    /// The format that was asked for, then the one that the queue reports.
    AudioFormatRecord format;
    std::array<AudioQueueBufferRef, kBufferCount> buffers;
    std::uint32_t bufferByteSize = 0;
    /// Packets received so far.
    std::int64_t currentPacket = 0;
    bool isRunning = false;
};

/// The queue of a tap that could not be made: every operation fails.
class MissingInputQueue : public AudioInputQueue {
  public:
    OptionalError setTapProcess(std::int32_t) override;
    Result<AudioFormatRecord> streamFormat() override;
    Result<std::uint32_t> maximumOutputPacketSize() override;
    Result<AudioQueueBufferRef> allocateBuffer(std::uint32_t) override;
    OptionalError enqueueBuffer(const AudioQueueBufferRef&) override;
    OptionalError freeBuffer(const AudioQueueBufferRef&) override;
    OptionalError start() override;
    OptionalError stop() override;
    OptionalError dispose() override;
    OptionalError addRunningListener(std::function<void()>) override;
    OptionalError removeRunningListener() override;
};

}  // namespace kelvo
