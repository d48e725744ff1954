#pragma once

#include "platform/linux/media/BoxWriter.h"
#include "platform/linux/media/MovieTrack.h"

#include <cstdint>
#include <span>
#include <vector>

namespace kelvo {

// What a fragment's boxes say, for those who write and who read them.
inline constexpr std::uint32_t kBaseIsFragment = 0x020000;
inline constexpr std::uint32_t kRunHasDataOffset = 0x001;
inline constexpr std::uint32_t kRunHasDurations = 0x100;
inline constexpr std::uint32_t kRunHasSizes = 0x200;
inline constexpr std::uint32_t kRunHasFlags = 0x400;
inline constexpr std::uint32_t kRunHasCompositionOffsets = 0x800;
inline constexpr std::uint32_t kRunContent =
    kRunHasDataOffset | kRunHasDurations | kRunHasSizes | kRunHasFlags | kRunHasCompositionOffsets;
inline constexpr std::uint32_t kSampleIsNoKeyFrame = 0x00010000;

/// Everything of a fragment but its samples' bytes: its header, and the head of the data box that those
/// bytes, run by run, and `padding` zero bytes then fill. A fragment's size is a multiple of 8.
struct FragmentHeader {
    Bytes bytes;
    std::size_t padding = 0;
};
FragmentHeader makeFragmentHeader(std::uint32_t sequenceNumber, std::span<const TrackFormat> tracks,
                                  std::span<const SampleRun> runs);

}  // namespace kelvo
