#pragma once

#include "base/Guarded.h"
#include "platform/AudioQueueBuffers.h"
#include "platform/simulated/SimulatedFaults.h"
#include "platform/simulated/SimulatedSound.h"

#include <chrono>
#include <mutex>

namespace kelvo {

/// A tap of the simulated device. A test lets sound pass through it; the callback runs on the test's thread.
/// Operations fail as ordered under their names, as in "AudioInputQueue.start". Thread-safe.
class SimulatedInputQueue : public AudioInputQueue {
  public:
    /// Frames in a buffer, at most; what its bytes hold, when that is less.
    static constexpr std::int64_t kFramesInBuffer = 4096;

    SimulatedInputQueue(const AudioFormatRecord& format, AudioInputCallback callback,
                        std::shared_ptr<SimulatedFaults> faults)
        : format_(format), callback_(std::move(callback)), faults_(std::move(faults)) {}

    OptionalError setTapProcess(std::int32_t processIdentifier) override;
    Result<AudioFormatRecord> streamFormat() override;
    Result<std::uint32_t> maximumOutputPacketSize() override;
    Result<AudioQueueBufferRef> allocateBuffer(std::uint32_t byteSize) override;
    OptionalError enqueueBuffer(const AudioQueueBufferRef& buffer) override;
    OptionalError freeBuffer(const AudioQueueBufferRef& buffer) override;
    OptionalError start() override;
    OptionalError stop() override;
    OptionalError dispose() override;
    OptionalError addRunningListener(std::function<void()> listener) override;
    OptionalError removeRunningListener() override;

    /// The process plays `tone` for `duration` from the moment `start` on.
    void play(const SimulatedTone& tone, std::chrono::nanoseconds start, std::chrono::nanoseconds duration);
    /// Calls back with the next enqueued buffer, filled with `content`, while the queue runs.
    void fillNextBuffer(const Bytes& content, std::chrono::nanoseconds start, std::uint32_t packetCount);
    /// Tells the listener that the queue runs, once more.
    void notifyRunning();

    /// Reports `format` in place of the one that the queue was made for.
    void setStreamFormat(const AudioFormatRecord& format) { format_.set(format); }

    std::int32_t process() const { return state_.copy().process; }
    bool isRunning() const { return state_.copy().run == Run::running; }
    bool isDisposed() const { return state_.copy().run == Run::disposed; }
    bool hasListener() const { return listener_.copy() != nullptr; }
    std::size_t enqueuedCount() const { return buffers_.enqueuedCount(); }

  private:
    enum class Run { idle, running, stopped, disposed };
    struct State {
        Run run = Run::idle;
        std::int32_t process = 0;
        double sampleTime = 0;
    };

    /// The failure that was ordered for `operation`, or that of a disposed queue.
    OptionalError refusal(const char* operation);
    /// Under `filling_`.
    void callBack(const AudioQueueBufferRef& buffer, std::chrono::nanoseconds start,
                  std::uint32_t packetCount);

    Guarded<AudioFormatRecord> format_;
    const AudioInputCallback callback_;
    const std::shared_ptr<SimulatedFaults> faults_;
    AudioQueueBuffers buffers_;
    Guarded<State> state_;
    Guarded<std::function<void()>> listener_;
    std::mutex filling_;  ///< held around callbacks, so that a stop waits for the one that runs
};

}  // namespace kelvo
