#pragma once

#include "base/VideoSurface.h"

#include <cstddef>
#include <cstdint>
#include <span>

namespace kelvo::x11 {

/// A cursor as the display server describes it: pixels are alpha, red, green, blue from the highest byte
/// down, with the colours already multiplied by alpha.
struct CursorImage {
    int left = 0;  ///< of the screen's left edge, the hot spot already taken off
    int top = 0;
    int width = 0;
    int height = 0;
    std::span<const std::uint32_t> pixels;
};

/// Draws `cursor` over a picture that shows the screen scaled by `scale` (above 0, at most 1). What lies
/// outside the picture is cut off.
void blendCursor(const CursorImage& cursor, double scale, const VideoSurface::Geometry& geometry,
                 std::span<std::byte> picture);

}  // namespace kelvo::x11
