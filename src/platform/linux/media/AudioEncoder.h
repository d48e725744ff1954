#pragma once

#include "base/Result.h"
#include "base/Value.h"
#include "platform/linux/media/AacEncoder.h"
#include "platform/linux/media/AudioAligner.h"
#include "platform/linux/media/MovieTrack.h"

#include <deque>
#include <functional>
#include <memory>
#include <vector>

namespace kelvo {

/// Makes a stereo AAC-LC track of sound without gaps. As long as left and right have been the same, which
/// they are with most microphones, only one channel is encoded: it takes little more than half the
/// processor's time. Caller's thread.
class AudioEncoder : public AlignedAudioSink {
  public:
    using SampleHandler = std::function<void(const SampleTiming&, std::span<const std::byte>)>;

    /// `handler` gets the encoded samples; times count in samples of the sample rate.
    static Result<std::unique_ptr<AudioEncoder>> open(const AudioSettings& settings, SampleHandler handler);

    /// What the movie's header says about this track.
    const TrackFormat& trackFormat() const { return format_; }

    void begin(std::int64_t position) override;
    OptionalError samples(std::span<const float> left, std::span<const float> right) override;
    OptionalError silence(std::int64_t count) override;

    /// Hands over what is still inside. Nothing is encoded any more.
    OptionalError flush();

  private:
    AudioEncoder(const AudioSettings& settings, AacEncoder encoder, SampleHandler handler);

    OptionalError encodeZeros(std::int64_t count);
    OptionalError encodeGathered();
    OptionalError encodeBothChannelsFromNowOn();
    AacEncoder::PacketHandler packetHandler();
    void handOver(std::int64_t duration);

    const AudioSettings settings_;
    const SampleHandler handler_;
    AacEncoder encoder_;  ///< of one channel until left and right differ
    const TrackFormat format_;
    const std::size_t frameSize_;
    std::vector<float> left_;  ///< gathered until a frame is full
    std::vector<float> right_;
    std::deque<std::vector<float>> latest_;  ///< what the encoder of one channel took at last
    std::int64_t nextDecodeTime_ = 0;
    Bytes lastSample_;
};

}  // namespace kelvo
