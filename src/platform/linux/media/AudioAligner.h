#pragma once

#include "base/KVError.h"
#include "platform/linux/media/LavPointers.h"
#include "platform/linux/media/PcmReader.h"

#include <cstdint>
#include <optional>
#include <span>
#include <vector>

namespace kelvo {

/// Where aligned sound goes: stereo, without gaps or overlaps from its first sample on.
class AlignedAudioSink {
  public:
    virtual ~AlignedAudioSink() = default;

    /// The very first sample lies this many samples after the timeline's beginning. Called once, first.
    virtual void begin(std::int64_t position) = 0;
    virtual OptionalError samples(std::span<const float> left, std::span<const float> right) = 0;
    virtual OptionalError silence(std::int64_t count) = 0;
};

/// Brings the sound of one track to the movie's clock: stereo of one sample rate, each sample within 12 ms of
/// its time for any length. Small differences (two clocks that do not run alike) are absorbed by resampling a
/// little faster or slower; a gap becomes silence and an overlap is cut. Caller's thread.
class AudioAligner {
  public:
    /// How a block joins the sound before it.
    enum class Joint {
        smooth,  ///< small differences are absorbed
        exact    ///< it begins at its time, to the sample
    };

    AudioAligner(int sampleRate, AlignedAudioSink& sink);

    /// Adds a block that begins `seconds` after the timeline's beginning; what lies before the beginning is
    /// cut. A block more than a day ahead is dropped.
    OptionalError add(PcmBlock block, double seconds, Joint joint = Joint::smooth);

    /// Hands over what is still in the resampler. Nothing is added any more.
    OptionalError flush();

  private:
    OptionalError prepareResampler(const PcmBlock& block);
    OptionalError beginAt(PcmBlock& block, double position);
    OptionalError fillGap(std::int64_t count);
    void cut(PcmBlock& block, double count);
    void follow(double difference);
    void stopFollowing();
    OptionalError resample(const PcmBlock& block);
    OptionalError resampleSilence(std::size_t count);
    /// Where the next sample put in comes out.
    double inputPosition() const;

    const int sampleRate_;
    AlignedAudioSink& sink_;
    ResamplerPointer resampler_;
    int inputRate_ = 0;
    std::size_t inputChannels_ = 0;
    std::optional<std::int64_t> position_;  ///< of the next sample that goes to the sink
    double smoothedDifference_ = 0;
    bool isCutting_ = false;  ///< the last block was cut whole
    std::vector<float> left_;
    std::vector<float> right_;
};

}  // namespace kelvo
