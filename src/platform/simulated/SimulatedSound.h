#pragma once

#include "base/MediaRecords.h"
#include "base/Value.h"

#include <bit>
#include <chrono>
#include <cmath>
#include <cstring>
#include <numbers>

namespace kelvo {

/// What something on the simulated device sounds like: a sine whose phase follows from the monotonic clock,
/// so that a test can say what any sample must be. Amplitude 1 is full scale.
struct SimulatedTone {
    double frequency = 0;
    double amplitude = 0;

    double at(double seconds) const {
        return amplitude * std::sin(2 * std::numbers::pi * frequency * seconds);
    }
};

/// How many frames of `format` lie in `duration`.
inline std::int64_t frameCount(const AudioFormatRecord& format, std::chrono::nanoseconds duration) {
    return std::llround(format.sampleRate * static_cast<double>(duration.count()) / 1e9);
}

/// Writes `frames` frames of `tone`, from the moment `start` on, as 16-bit samples of `format`.
inline void writeTone(const SimulatedTone& tone, const AudioFormatRecord& format,
                      std::chrono::nanoseconds start, std::int64_t frames, std::byte* bytes) {
    for (std::int64_t frame = 0; frame < frames; ++frame) {
        const double moment =
            static_cast<double>(start.count()) / 1e9 + static_cast<double>(frame) / format.sampleRate;
        auto sample =
            static_cast<std::uint16_t>(static_cast<std::int16_t>(std::lround(32767 * tone.at(moment))));
        if ((format.formatFlags & kAudioFlagBigEndian) != 0) {
            sample = static_cast<std::uint16_t>(sample << 8 | sample >> 8);
        }
        for (std::uint32_t channel = 0; channel < format.channelsPerFrame; ++channel, bytes += 2)
            std::memcpy(bytes, &sample, 2);
    }
}

}  // namespace kelvo
