#pragma once

#include "base/Clock.h"

#include <atomic>

namespace kelvo {

/// A clock that moves only when it is told to. Starts at 14 November 2023, 22:13:20 UTC. Thread-safe.
class SimulatedClock : public Clock {
  public:
    Date now() const override { return {kStart + elapsed_.load()}; }
    std::chrono::nanoseconds monotonicNow() const override {
        return std::chrono::nanoseconds(elapsed_.load());
    }

    void advance(std::chrono::nanoseconds interval) { elapsed_ += interval.count(); }

  private:
    static constexpr std::int64_t kStart = 1700000000LL * 1000000000LL;
    std::atomic<std::int64_t> elapsed_{0};
};

}  // namespace kelvo
