#include "platform/simulated/NumberedPicture.h"

#include <algorithm>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

std::shared_ptr<VideoSurface> drawn(std::uint32_t number, std::uint32_t width, std::uint32_t height) {
    auto surface = *VideoSurface::create(VideoSurface::Geometry::packed(width, height));
    NumberedPicture::draw(number, surface->geometry(), surface->writablePixels());
    return surface;
}

TEST(NumberedPicture, IsReadAsTheNumberThatWasDrawn) {
    for (const std::uint32_t number : {0U, 1U, 255U, 0x12345678U, 0xFFFFFFFFU})
        EXPECT_EQ(NumberedPicture::read(*drawn(number, 108, 192)), number);
}

TEST(NumberedPicture, FitsEverySize) {
    for (const std::uint32_t width : {16U, 17U, 53U, 1080U}) {
        for (const std::uint32_t height : {10U, 11U, 80U, 333U})
            EXPECT_EQ(NumberedPicture::read(*drawn(4711, width, height)), 4711U) << width << "x" << height;
    }
}

TEST(NumberedPicture, BlackAndWhiteAreNoNumbers) {
    EXPECT_FALSE(NumberedPicture::read(80, 50, [](auto, auto) { return 0; }));
    EXPECT_FALSE(NumberedPicture::read(80, 50, [](auto, auto) { return 255; }));
}

TEST(NumberedPicture, HalfDrawnPictureIsNoNumber) {
    const auto before = drawn(1, 80, 50);
    const auto after = drawn(2, 80, 50);
    const auto half = before->pixels().size() / 4;
    std::copy_n(after->pixels().begin(), half, before->writablePixels().begin());
    EXPECT_FALSE(NumberedPicture::read(*before));
}

}  // namespace
}  // namespace kelvo
