#include "platform/simulated/NumberedPicture.h"

#include <algorithm>

namespace kelvo {
namespace {

constexpr std::uint32_t kNumberBits = 32;
constexpr std::uint32_t kCheckSeed = 0xA5;  // so that neither black nor white is a number

std::uint32_t checkOf(std::uint32_t number) {
    return (kCheckSeed ^ number ^ number >> 8 ^ number >> 16 ^ number >> 24) & 0xFF;
}

bool bitOf(std::uint32_t number, std::uint32_t index) {
    if (index < kNumberBits) return (number >> index & 1) != 0;
    return (checkOf(number) >> (index - kNumberBits) & 1) != 0;
}

}  // namespace

NumberedPicture::Blocks NumberedPicture::blocks(std::uint32_t number) {
    Blocks blocks{};
    for (std::uint32_t i = 0; i < blocks.size(); ++i)
        blocks[i] = bitOf(number, i);
    return blocks;
}

void NumberedPicture::draw(std::uint32_t number, const VideoSurface::Geometry& geometry,
                           std::span<std::byte> pixels) {
    const Blocks all = blocks(number);
    for (std::uint32_t y = 0; y < geometry.height; ++y) {
        std::byte* const row = pixels.data() + std::size_t{y} * geometry.bytesPerRow;
        std::uint32_t blockRow = kRows - 1;
        while (y < blockRow * geometry.height / kRows)
            --blockRow;
        for (std::uint32_t column = 0; column < kColumns; ++column) {
            const std::size_t begin = std::size_t{column} * geometry.width / kColumns;
            const std::size_t end = std::size_t{column + 1} * geometry.width / kColumns;
            const std::byte shade{static_cast<unsigned char>(all[blockRow * kColumns + column] ? 0xFF : 0)};
            std::fill(row + begin * 4, row + end * 4, shade);
        }
    }
}

std::optional<std::uint32_t> NumberedPicture::read(std::uint32_t width, std::uint32_t height,
                                                   const Brightness& brightness) {
    std::uint32_t number = 0;
    std::uint32_t check = 0;
    for (std::uint32_t i = 0; i < kColumns * kRows; ++i) {
        const std::uint32_t x = (2 * (i % kColumns) + 1) * width / (2 * kColumns);
        const std::uint32_t y = (2 * (i / kColumns) + 1) * height / (2 * kRows);
        const std::uint32_t bit = brightness(x, y) > 127 ? 1 : 0;
        if (i < kNumberBits) {
            number |= bit << i;
        } else {
            check |= bit << (i - kNumberBits);
        }
    }
    if (check != checkOf(number)) return std::nullopt;
    return number;
}

std::optional<std::uint32_t> NumberedPicture::read(const VideoSurface& surface) {
    const auto pixels = surface.pixels();
    const VideoSurface::Geometry& geometry = surface.geometry();
    return read(geometry.width, geometry.height, [&](std::uint32_t x, std::uint32_t y) {
        return std::to_integer<int>(pixels[std::size_t{y} * geometry.bytesPerRow + std::size_t{x} * 4 + 1]);
    });
}

}  // namespace kelvo
