#pragma once

#include "base/Value.h"
#include "platform/WriterInput.h"

#include <array>
#include <cstdint>
#include <vector>

namespace kelvo {

/// What a movie file says about one of its tracks. Times of a track count in units of 1 / `timescale` seconds
/// from the movie's beginning.
struct TrackFormat {
    /// How the picture is turned: the nine fixed-point numbers of a file's matrix.
    using Matrix = std::array<std::int32_t, 9>;
    static constexpr Matrix kUpright{0x10000, 0, 0, 0, 0x10000, 0, 0, 0, 0x40000000};

    MediaType type = MediaType::video;
    std::uint32_t timescale = 90000;
    /// How long before what is presented the first decode time lies: an encoder's priming, or the frames from
    /// a key frame to the first frame shown.
    std::int64_t lead = 0;
    /// The decoder configuration: an AVC configuration record, or an AAC audio specific configuration.
    Bytes codecConfiguration;

    // Video.
    std::uint16_t width = 0;
    std::uint16_t height = 0;
    Matrix matrix = kUpright;
    /// Whether the colours are those that our own conversion makes; else the stream itself must tell.
    bool hasOwnColours = false;

    // Audio.
    std::uint32_t sampleRate = 0;
    std::uint16_t channelCount = 0;
    std::uint32_t bitRate = 0;
};

/// The timing of one encoded sample.
struct SampleTiming {
    std::int64_t decodeTime = 0;
    std::int32_t compositionOffset = 0;  ///< presentation time minus decode time
    std::uint32_t duration = 0;  ///< as far as it is known; the next sample's decode time is what counts
    bool isKeyFrame = true;
};

/// Consecutive samples of one track, with their bytes one after the other.
struct SampleRun {
    struct Sample {
        SampleTiming timing;
        std::uint32_t size = 0;
    };
    std::vector<Sample> samples;
    Bytes data;

    bool empty() const { return samples.empty(); }
    void clear() {
        samples.clear();
        data.clear();
    }
};

}  // namespace kelvo
