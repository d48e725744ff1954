#pragma once

#include "base/KVError.h"
#include "base/VideoSurface.h"
#include "platform/linux/media/LavPointers.h"

#include <cstdint>
#include <vector>

namespace kelvo {

/// Turns surfaces into the frames of one encoder: BT.601, limited range, 4:2:0. A surface of another shape is
/// scaled with its aspect kept and centred; the rest stays black. Caller's thread.
class FrameConverter {
  public:
    FrameConverter(int width, int height) : width_(width), height_(height) {}

    /// The one frame, filled with the picture of `surface`; none without memory. It is filled again by the
    /// next call, so encoders that keep frames get copies.
    AVFrame* convert(const VideoSurface& surface);

  private:
    struct Rectangle {
        int x = 0;
        int y = 0;
        int width = 0;
        int height = 0;
        friend bool operator==(const Rectangle&, const Rectangle&) = default;
    };

    bool prepareFrame();
    Rectangle fit(int width, int height) const;
    void blacken();
    void scaleInto(const VideoSurface& surface, const Rectangle& target);

    const int width_;
    const int height_;
    FramePointer frame_;
    Rectangle filled_;
    std::vector<std::uint8_t> unscaled_;
};

}  // namespace kelvo
