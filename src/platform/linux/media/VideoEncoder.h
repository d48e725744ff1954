#pragma once

#include "base/Result.h"
#include "base/Value.h"
#include "platform/linux/media/EncoderSettings.h"
#include "platform/linux/media/LavPointers.h"
#include "platform/linux/media/MovieTrack.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

namespace kelvo {

/// An H.264 encoder without frame reordering, so that samples come out in the order of their presentation.
/// Caller's thread.
class VideoEncoder {
  public:
    /// Times of frames and samples count in units of 1 / kTimescale seconds.
    static constexpr std::uint32_t kTimescale = 90000;
    using SampleHandler = std::function<void(const SampleTiming&, std::span<const std::byte>)>;

    /// What the frames are for.
    enum class Purpose {
        live,   ///< each frame comes out at once; a hardware encoder is taken when one opens
        master  ///< all cores work on several frames at a time, without visible loss
    };
    /// How the frames are given.
    struct Source {
        AVPixelFormat pixelFormat = AV_PIX_FMT_YUV420P;
        AVColorPrimaries primaries = AVCOL_PRI_SMPTE170M;
        AVColorTransferCharacteristic transfer = AVCOL_TRC_SMPTE170M;
        AVColorSpace matrix = AVCOL_SPC_SMPTE170M;
        AVColorRange range = AVCOL_RANGE_MPEG;
    };

    static Result<std::unique_ptr<VideoEncoder>> open(const VideoSettings& settings, Purpose purpose,
                                                      const Source& source);

    /// The decoder configuration for the movie's header.
    const Bytes& configuration() const { return configuration_; }
    /// The encoder's name, for the log.
    std::string name() const { return context_->codec->name; }

    /// Encodes `frame` at `time`, later than the frame before, and hands over what comes out. Its duration is
    /// that of a frame at the expected rate.
    OptionalError encode(AVFrame& frame, std::int64_t time, const SampleHandler& handler);
    /// Hands over what is still inside. Nothing is encoded any more.
    OptionalError flush(const SampleHandler& handler);

  private:
    VideoEncoder(CodecContextPointer context, const VideoSettings& settings);

    bool findConfiguration();
    OptionalError send(const AVFrame* frame, const SampleHandler& handler);

    const CodecContextPointer context_;
    const PacketPointer packet_;
    const std::uint32_t frameDuration_;
    const std::int64_t longestKeyInterval_;  ///< 0 is none
    std::int64_t lastKeyTime_ = 0;
    Bytes configuration_;
    Bytes sample_;
};

}  // namespace kelvo
