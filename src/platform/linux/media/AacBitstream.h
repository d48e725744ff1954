#pragma once

#include "base/Result.h"
#include "base/Value.h"

#include <span>

namespace kelvo {

// AAC-LC of one channel as a stereo track has it, with the same sound left and right: the right channel is
// written as the left one's intensity, which takes a bit for each band, and nothing is encoded a second time.
// The decoder's left and right are to the bit what it would make of the single channel. All thread-safe.

/// About what the second channel adds to a frame, in bits.
constexpr int kAacSecondChannelBits = 77;

/// The frame (a raw data block) of two channels for one of a single channel. Fails with
/// kMediaErrorEncodingFailed on anything but a single channel element followed by the end.
Result<Bytes> aacStereoFrame(std::span<const std::byte> monoFrame);

/// The decoder configuration of two channels for one of a single channel.
Bytes aacStereoConfiguration(std::span<const std::byte> monoConfiguration);

}  // namespace kelvo
