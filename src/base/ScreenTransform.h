#pragma once

#include "base/Geometry.h"

#include <cstdint>

namespace kelvo {

/// How the pixels of a screen's frame must be moved to stand upright: first mirrored left to right, when
/// `mirrored` is set, then turned clockwise by quarter turns.
struct ScreenTransform {
    std::uint8_t quarterTurns = 0;  ///< 0 to 3, clockwise
    bool mirrored = false;

    friend bool operator==(const ScreenTransform&, const ScreenTransform&) = default;
};

/// The transform that puts the upright picture of a frame of `frameSize` pixels into the corner where both
/// coordinates begin at 0.
AffineTransform affineTransform(const ScreenTransform& transform, const Size& frameSize);

/// The same as image files number it: 1 (upright) to 8.
std::uint32_t imageOrientation(const ScreenTransform& transform);

}  // namespace kelvo
