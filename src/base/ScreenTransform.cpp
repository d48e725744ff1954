#include "base/ScreenTransform.h"

#include <array>
#include <utility>

namespace kelvo {
namespace {

constexpr unsigned kTurns = 4;

/// A quarter turn clockwise after `first`, of a picture whose height is then `height`.
AffineTransform turnedOnce(const AffineTransform& first, double height) {
    return {-first.b, first.a, -first.d, first.c, height - first.ty, first.tx};
}

}  // namespace

AffineTransform affineTransform(const ScreenTransform& transform, const Size& frameSize) {
    AffineTransform result;
    if (transform.mirrored) result = {-1, 0, 0, 1, frameSize.width, 0};
    Size size = frameSize;
    for (unsigned turn = 0; turn < transform.quarterTurns % kTurns; ++turn) {
        result = turnedOnce(result, size.height);
        std::swap(size.width, size.height);
    }
    return result;
}

std::uint32_t imageOrientation(const ScreenTransform& transform) {
    constexpr std::array<std::uint32_t, kTurns> kPlain{1, 6, 3, 8};
    constexpr std::array<std::uint32_t, kTurns> kMirrored{2, 7, 4, 5};
    const unsigned turns = transform.quarterTurns % kTurns;
    return transform.mirrored ? kMirrored[turns] : kPlain[turns];
}

}  // namespace kelvo
