#pragma once

#include "base/Clock.h"

namespace kelvo {

/// The host's clocks: CLOCK_REALTIME and CLOCK_MONOTONIC. Thread-safe.
class SystemClock : public Clock {
  public:
    Date now() const override;
    std::chrono::nanoseconds monotonicNow() const override;
};

}  // namespace kelvo
