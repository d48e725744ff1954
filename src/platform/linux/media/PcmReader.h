#pragma once

#include "base/MediaRecords.h"
#include "base/Result.h"
#include "base/SampleBuffer.h"

#include <cstddef>
#include <vector>

namespace kelvo {

/// Sound as numbers from -1 to 1, one vector of equal length a channel.
struct PcmBlock {
    double sampleRate = 0;
    std::vector<std::vector<float>> channels;

    std::size_t sampleCount() const { return channels.empty() ? 0 : channels.front().size(); }
    /// Drops the first `count` samples of every channel.
    void dropFirst(std::size_t count);
    /// `count` samples of every channel from number `first` on; the block has that many.
    PcmBlock part(std::size_t first, std::size_t count) const;
};

/// The sound of `sample`: linear PCM of 1 to 8 channels and 8000 to 192000 Hz; integers of 8 to 32 bits or
/// floats of 32 or 64, in either byte order, packed or not, interleaved or not. Fails on any other format.
/// Samples that the buffer does not hold are left out. Thread-safe.
Result<PcmBlock> readPcm(const SampleBuffer& sample);

}  // namespace kelvo
