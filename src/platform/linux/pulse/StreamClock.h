#pragma once

#include <chrono>
#include <cstdint>

namespace kelvo::pulse {

/// Length of `frames` frames at `rate` frames a second, and the frames that fit into `duration`.
std::chrono::nanoseconds durationOf(std::int64_t frames, std::uint32_t rate);
std::int64_t framesIn(std::chrono::nanoseconds duration, std::uint32_t rate);

/// Says when each block of a stream sounded, on the host's monotonic clock, from what the server says about
/// its latency. What the server says jitters by a millisecond or so; the blocks follow one another without a
/// gap and drift gently towards it, so that the sound card's clock and ours do not part. Not thread-safe.
class StreamClock {
  public:
    /// Estimates further off than this mean that sound was lost or held up, not jitter.
    static constexpr std::chrono::milliseconds kLargestJitter{40};
    /// As does a mean of the estimates that is further off than this: the server's first ones may be.
    static constexpr std::chrono::milliseconds kLargestDrift{5};

    explicit StreamClock(std::uint32_t rate) : rate_(rate) {}

    /// When the next block of `frames` frames began, if the server puts its beginning at `estimate`.
    std::chrono::nanoseconds place(std::chrono::nanoseconds estimate, std::int64_t frames);

    /// The next block begins anew.
    void reset() { isPlaced_ = false; }

  private:
    void placeAt(std::chrono::nanoseconds moment);

    const std::uint32_t rate_;
    std::chrono::nanoseconds next_{};
    std::chrono::nanoseconds error_{};  ///< smoothed distance of the estimates from where blocks were placed
    bool isPlaced_ = false;
};

}  // namespace kelvo::pulse
