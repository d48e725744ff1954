#pragma once

#include "base/Result.h"
#include "base/Value.h"

#include <cstdint>
#include <optional>

namespace kelvo {

/// The output settings of a video input, read and brought into range.
struct VideoSettings {
    enum class Profile { baseline, main, high };

    int width = 0;
    int height = 0;
    /// Bits per second; none leaves the rate to the encoder at `constantQuality`.
    std::optional<std::int64_t> averageBitRate;
    /// 0 is lossless, 51 the worst.
    int constantQuality = 23;
    double frameRate = 60;
    int maxKeyFrameInterval = 250;
    double maxKeyFrameIntervalSeconds = 0;  ///< 0 is no limit
    Profile profile = Profile::high;

    /// Fails when the codec or the size is none that can be encoded. Compression properties that are unknown
    /// or of a wrong type are logged and ignored.
    static Result<VideoSettings> fromOutputSettings(const Dictionary& settings);
};

/// The output settings of an audio input.
struct AudioSettings {
    int sampleRate = 44100;
    int channelCount = 2;
    std::int64_t bitRate = 128000;

    /// Fails on what no AAC encoder takes.
    static Result<AudioSettings> fromOutputSettings(const Dictionary& settings);
};

}  // namespace kelvo
