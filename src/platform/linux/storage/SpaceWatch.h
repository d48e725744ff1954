#pragma once

#include "platform/StoragePurgeService.h"

#include <chrono>
#include <cstdint>

namespace kelvo {

/// Decides when to ask for disk space back, from one look at the volume after the other. Not thread-safe.
class SpaceWatch {
  public:
    /// Free bytes below which space is wanted with urgency 1, 2 and 3. A recording needs 100 MB to start, so
    /// the last bound stops one that goes on into what the rest of the system needs.
    static constexpr std::uint64_t kLowBound = 1000000000;
    static constexpr std::uint64_t kLowerBound = 300000000;
    static constexpr std::uint64_t kLowestBound = 64000000;
    /// While space stays short it is asked for again this often.
    static constexpr std::chrono::minutes kRepeat{5};
    static constexpr std::chrono::hours kPeriod{1};

    SpaceWatch(StoragePurgeCallbacks callbacks, std::chrono::nanoseconds now)
        : callbacks_(std::move(callbacks)), lastPeriodic_(now) {}

    /// The urgency at which `freeBytes` stand; 0 when there is room.
    static PurgeUrgency urgencyFor(std::uint64_t freeBytes);

    /// Looks at `freeBytes` at the monotonic time `now` and calls what is due: the purge when the urgency has
    /// risen or its repetition has come, the cancellation when there is room again, the periodic one once an
    /// hour.
    void look(std::uint64_t freeBytes, std::chrono::nanoseconds now);

  private:
    void purge(PurgeUrgency urgency, std::chrono::nanoseconds now);

    StoragePurgeCallbacks callbacks_;
    std::chrono::nanoseconds lastPeriodic_;
    std::chrono::nanoseconds lastPurge_{};
    PurgeUrgency urgency_ = 0;
    std::uint64_t lastFreed_ = 0;
};

}  // namespace kelvo
