#pragma once

#include "base/MediaRecords.h"

#include <optional>
#include <span>
#include <vector>

namespace kelvo {

/// A copy of `timing` in which every record presents at `presentationTime` and has no decode time; durations
/// stay. None, logged, when the records' bytes cannot be counted in 64 bits: such a count is corrupt, and
/// nothing is allocated for it. Thread-safe.
std::optional<std::vector<TimingRecord>> rebasedTiming(std::span<const TimingRecord> timing,
                                                       const MediaTime& presentationTime);

}  // namespace kelvo
