#include "platform/linux/pulse/StreamClock.h"

namespace kelvo::pulse {
namespace {

constexpr std::int64_t kNanosecondsPerSecond = 1000000000;
/// One in so many parts of the distance enters the mean, and one in so many of the mean is made up for.
constexpr int kSmoothing = 16;
constexpr int kPull = 16;

}  // namespace

std::chrono::nanoseconds durationOf(std::int64_t frames, std::uint32_t rate) {
    const std::int64_t rest = frames % rate;
    return std::chrono::seconds(frames / rate) +
           std::chrono::nanoseconds(rest * kNanosecondsPerSecond / rate);
}

std::int64_t framesIn(std::chrono::nanoseconds duration, std::uint32_t rate) {
    const std::int64_t seconds = duration.count() / kNanosecondsPerSecond;
    const std::int64_t rest = duration.count() % kNanosecondsPerSecond;
    return seconds * rate + rest * rate / kNanosecondsPerSecond;
}

void StreamClock::placeAt(std::chrono::nanoseconds moment) {
    isPlaced_ = true;
    next_ = moment;
    error_ = {};
}

std::chrono::nanoseconds StreamClock::place(std::chrono::nanoseconds estimate, std::int64_t frames) {
    const auto distance = estimate - next_;
    if (!isPlaced_ || std::chrono::abs(distance) > kLargestJitter) {
        placeAt(estimate);
    } else {
        error_ += (distance - error_) / kSmoothing;
        if (std::chrono::abs(error_) > kLargestDrift) {
            placeAt(next_ + error_);
        } else {
            const auto correction = error_ / kPull;
            next_ += correction;
            error_ -= correction;
        }
    }
    const auto begin = next_;
    next_ += durationOf(frames, rate_);
    return begin;
}

}  // namespace kelvo::pulse
