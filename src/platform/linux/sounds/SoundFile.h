#pragma once

#include "base/Result.h"

#include <cstdint>
#include <string>
#include <string_view>

namespace kelvo {

/// A short sound: 16-bit PCM, little endian.
struct SoundFile {
    /// The largest file that is read.
    static constexpr std::size_t kMostBytes = 1U << 20;

    std::uint32_t rate = 0;     ///< 8000 to 96000 Hz
    std::uint8_t channels = 0;  ///< 1 or 2, interleaved
    std::string samples;        ///< whole frames

    /// Reads a WAVE file's bytes. Fails, saying what is wrong, on anything else and on sound of another form.
    static Result<SoundFile> parse(std::string_view bytes);
};

}  // namespace kelvo
