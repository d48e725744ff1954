#pragma once

#include "platform/linux/media/Decoder.h"
#include "platform/linux/media/ExportParts.h"
#include "platform/linux/media/VideoEncodingThread.h"

#include <functional>
#include <memory>

namespace kelvo {

/// The picture's way through a mix: decoded on the caller's thread, encoded again on another. Caller's
/// thread.
class MixPicture {
  public:
    /// `onFrame` gets each frame's time in seconds from the range's start, as it goes to the encoder.
    static Result<std::unique_ptr<MixPicture>> open(const ExportSource& source,
                                                    VideoEncoder::SampleHandler handler,
                                                    std::function<void(double)> onFrame);

    /// What the movie's header says about the track.
    const TrackFormat& trackFormat() const { return format_; }

    /// Takes a packet of the picture's stream.
    OptionalError take(const AVPacket& packet) { return decode(&packet); }
    /// Hands over everything that is still inside. Nothing is taken any more.
    OptionalError flush();

  private:
    MixPicture(const ExportSource& source, Decoder decoder, std::unique_ptr<VideoEncoder> encoder,
               VideoEncoder::SampleHandler handler, std::function<void(double)> onFrame);

    OptionalError decode(const AVPacket* packet);
    OptionalError encode(AVFrame& frame);

    const ExportSource& source_;
    const std::function<void(double)> onFrame_;
    TrackFormat format_;
    Decoder decoder_;
    VideoEncodingThread encoder_;
    std::int64_t lastTime_ = -1;
};

}  // namespace kelvo
