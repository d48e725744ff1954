#pragma once

#include "base/SampleBuffer.h"

namespace kelvo {

/// Gaps longer than this are not filled: the bytes would be many, and the clock was most likely set.
inline constexpr double kLongestGapSeconds = 600;

/// Silence in the format `description` that fills a gap: `seconds` long, presented at `start`. Its frames are
/// counted at 44100 Hz, whatever rate the description names. None when `seconds` is not a number between 0
/// and `kLongestGapSeconds`, or when the description has no frames in a packet. Thread-safe.
SampleBufferRef makeGapSample(const AudioFormatRecord& description, double seconds, const MediaTime& start);

}  // namespace kelvo
