#pragma once

#include <algorithm>

namespace kelvo {

/// A width and a height, in pixels unless its user says otherwise.
struct Size {
    double width = 0;
    double height = 0;

    friend bool operator==(const Size&, const Size&) = default;
};

/// Moves points of the plane: x' = a*x + c*y + tx, y' = b*x + d*y + ty. The y axis points down, as rows of
/// pixels do.
struct AffineTransform {
    double a = 1;
    double b = 0;
    double c = 0;
    double d = 1;
    double tx = 0;
    double ty = 0;

    friend bool operator==(const AffineTransform&, const AffineTransform&) = default;
};

/// How much a picture must shrink to lie within `bounds`, its aspect ratio kept; never more than 1, because
/// pictures are not enlarged. Sides are positive.
inline double scaleToFit(const Size& picture, const Size& bounds) {
    return std::min({1.0, bounds.width / picture.width, bounds.height / picture.height});
}

}  // namespace kelvo
