#include "platform/linux/x11/CursorImage.h"

#include <array>
#include <cstring>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::x11 {
namespace {

const auto kGeometry = VideoSurface::Geometry::packed(8, 4);
constexpr std::uint32_t kGrey = 0x808080;

/// A grey picture of 8 by 4 pixels.
class BlendCursor : public testing::Test {
  protected:
    BlendCursor() {
        for (int i = 0; i < 32; ++i)
            std::memcpy(picture_.data() + i * 4, &kGrey, 4);
    }
    std::uint32_t at(int x, int y) const {
        std::uint32_t pixel = 0;
        std::memcpy(&pixel, picture_.data() + (y * 8 + x) * 4, 4);
        return pixel & 0xFFFFFF;
    }
    int changedPixels() const {
        int count = 0;
        for (int i = 0; i < 32; ++i)
            count += at(i % 8, i / 8) != kGrey ? 1 : 0;
        return count;
    }
    void blend(int left, int top, int width, int height, std::span<const std::uint32_t> pixels,
               double scale = 1) {
        blendCursor({left, top, width, height, pixels}, scale, kGeometry, picture_);
    }

    std::vector<std::byte> picture_ = std::vector<std::byte>(kGeometry.byteCount());
};

constexpr std::array<std::uint32_t, 4> kOpaqueRed{0xFFFF0000, 0xFFFF0000, 0xFFFF0000, 0xFFFF0000};

TEST_F(BlendCursor, OpaquePixelsReplaceThePicture) {
    blend(2, 1, 2, 2, kOpaqueRed);
    EXPECT_EQ(at(2, 1), 0xFF0000U);
    EXPECT_EQ(at(3, 2), 0xFF0000U);
    EXPECT_EQ(changedPixels(), 4);
}

TEST_F(BlendCursor, TransparentPixelsLeaveThePicture) {
    const std::array<std::uint32_t, 1> clear{0};
    blend(0, 0, 1, 1, clear);
    EXPECT_EQ(changedPixels(), 0);
}

TEST_F(BlendCursor, HalfTransparentPixelsMix) {
    const std::array<std::uint32_t, 1> half{0x80000080};  // blue, already multiplied by its alpha
    blend(0, 0, 1, 1, half);
    EXPECT_EQ(at(0, 0), 0x3F3FBFU);
}

TEST_F(BlendCursor, IsCutOffAtEveryEdge) {
    for (const auto& [left, top] : {std::pair{-1, -1}, {7, 3}, {-1, 3}, {7, -1}}) {
        blend(left, top, 2, 2, kOpaqueRed);
    }
    EXPECT_EQ(changedPixels(), 4);
}

TEST_F(BlendCursor, OutsideThePictureNothingIsDrawn) {
    blend(100, 100, 2, 2, kOpaqueRed);
    blend(-100, -100, 2, 2, kOpaqueRed);
    EXPECT_EQ(changedPixels(), 0);
}

TEST_F(BlendCursor, ShrinksWithTheScreen) {
    blend(4, 2, 2, 2, kOpaqueRed, 0.5);
    EXPECT_EQ(at(2, 1), 0xFF0000U);
    EXPECT_EQ(changedPixels(), 1);
}

TEST_F(BlendCursor, ImageWithTooFewPixelsIsLeftOut) {
    blend(0, 0, 4, 4, kOpaqueRed);
    EXPECT_EQ(changedPixels(), 0);
}

}  // namespace
}  // namespace kelvo::x11
