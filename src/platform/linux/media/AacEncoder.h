#pragma once

#include "base/Result.h"
#include "platform/linux/media/EncoderSettings.h"
#include "platform/linux/media/LavPointers.h"

#include <cstdint>
#include <functional>
#include <span>

namespace kelvo {

/// An AAC-LC encoder of one or two channels, fed frame by frame. Caller's thread.
class AacEncoder {
  public:
    /// Gets an encoded frame and how many samples of it count: all but in the last one.
    using PacketHandler = std::function<OptionalError(std::span<const std::byte>, std::int64_t)>;

    static Result<AacEncoder> open(const AudioSettings& settings, int channelCount);

    int channelCount() const { return context_->ch_layout.nb_channels; }
    /// How many samples a frame has.
    std::size_t frameSize() const { return static_cast<std::size_t>(context_->frame_size); }
    /// How many samples the decoder puts out before the first one that was put in.
    int lead() const { return context_->initial_padding; }
    std::span<const std::byte> configuration() const;

    /// Takes a frame, shorter than a whole one only at the end; the right channel is left alone by an encoder
    /// of one. What comes out lags by a frame. Fails with what `handler` fails with, too.
    OptionalError encode(std::span<const float> left, std::span<const float> right,
                         const PacketHandler& handler);
    /// Hands over what is still inside. Nothing is encoded any more.
    OptionalError flush(const PacketHandler& handler);

  private:
    explicit AacEncoder(CodecContextPointer context);

    OptionalError send(const AVFrame* frame, const PacketHandler& handler);

    CodecContextPointer context_;
    FramePointer frame_;
    PacketPointer packet_;
    std::int64_t encodedCount_ = 0;
};

}  // namespace kelvo
