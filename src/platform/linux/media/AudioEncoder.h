#pragma once

#include "base/Result.h"
#include "base/Value.h"
#include "platform/linux/media/AudioAligner.h"
#include "platform/linux/media/EncoderSettings.h"
#include "platform/linux/media/LavPointers.h"
#include "platform/linux/media/MovieTrack.h"

#include <functional>
#include <memory>
#include <vector>

namespace kelvo {

/// A stereo AAC-LC encoder for sound without gaps. Caller's thread.
class AudioEncoder : public AlignedAudioSink {
  public:
    using SampleHandler = std::function<void(const SampleTiming&, std::span<const std::byte>)>;

    /// `handler` gets the encoded samples; times count in samples of the sample rate.
    static Result<std::unique_ptr<AudioEncoder>> open(const AudioSettings& settings, SampleHandler handler);

    /// What the movie's header says about this track.
    TrackFormat trackFormat() const;

    void begin(std::int64_t position) override;
    OptionalError samples(std::span<const float> left, std::span<const float> right) override;
    OptionalError silence(std::int64_t count) override;

    /// Hands over what is still inside. Nothing is encoded any more.
    OptionalError flush();

  private:
    AudioEncoder(CodecContextPointer context, SampleHandler handler);

    OptionalError encodeZeros(std::int64_t count);
    OptionalError encodeGathered();
    OptionalError send(const AVFrame* frame);
    void handOver(std::span<const std::byte> data, std::uint32_t duration);

    const CodecContextPointer context_;
    const SampleHandler handler_;
    const FramePointer frame_;
    const PacketPointer packet_;
    const std::size_t frameSize_;
    std::vector<float> left_;  ///< gathered until a frame is full
    std::vector<float> right_;
    std::int64_t encodedCount_ = 0;
    std::int64_t nextDecodeTime_ = 0;
    Bytes lastSample_;
};

}  // namespace kelvo
