#pragma once

#include "base/KVError.h"
#include "base/VideoSurface.h"
#include "platform/linux/media/LavPointers.h"

#include <cstdint>
#include <vector>

namespace kelvo {

/// Turns surfaces into the frames of one encoder: BT.601, limited range, 4:2:0. A surface of another shape is
/// scaled with its aspect kept and centred; the rest stays black. One thread at a time.
class FrameConverter {
  public:
    FrameConverter(int width, int height) : width_(width), height_(height) {}

    /// A frame with the picture of `surface`, which is not needed any more; none without memory. The frame's
    /// memory is used again once the caller and its encoder have let go of it, on whatever thread.
    FramePointer convert(const VideoSurface& surface);

  private:
    struct Rectangle {
        int x = 0;
        int y = 0;
        int width = 0;
        int height = 0;
        friend bool operator==(const Rectangle&, const Rectangle&) = default;
    };

    struct Canvas {
        FramePointer frame;
        Rectangle filled;  ///< the rest is black
    };

    Canvas* freeCanvas();
    FramePointer makeFrame() const;
    Rectangle fit(int width, int height) const;
    void blacken(const AVFrame& frame) const;
    void scaleInto(const AVFrame& frame, const VideoSurface& surface, const Rectangle& target);

    const int width_;
    const int height_;
    std::vector<Canvas> canvases_;
    std::vector<std::uint8_t> unscaled_;
};

}  // namespace kelvo
