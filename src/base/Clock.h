#pragma once

#include "base/Date.h"

#include <chrono>

namespace kelvo {

/// Where the time comes from. Implemented by the operating system's clocks and by the simulated device, whose
/// clock moves only when a test moves it. Thread-safe.
class Clock {
  public:
    virtual ~Clock() = default;

    /// Wall-clock time; it may jump when the user sets it.
    virtual Date now() const = 0;

    /// Time that only goes forward, from an arbitrary start: the host's monotonic clock, on which all media
    /// timestamps lie.
    virtual std::chrono::nanoseconds monotonicNow() const = 0;
};

}  // namespace kelvo
