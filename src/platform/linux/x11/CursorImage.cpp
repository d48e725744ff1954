#include "platform/linux/x11/CursorImage.h"

#include <algorithm>
#include <cmath>
#include <cstring>

namespace kelvo::x11 {
namespace {

constexpr std::uint32_t kOpaque = 255;

/// One premultiplied pixel over another, channel by channel.
std::uint32_t over(std::uint32_t top, std::uint32_t below) {
    const std::uint32_t coverage = top >> 24;
    if (coverage == kOpaque) return top;
    std::uint32_t result = 0;
    for (unsigned shift = 0; shift < 24; shift += 8) {
        const std::uint32_t kept = (below >> shift & 0xFF) * (kOpaque - coverage) / kOpaque;
        result |= std::min((top >> shift & 0xFF) + kept, kOpaque) << shift;
    }
    return result;
}

struct Range {
    int begin;
    int end;
};

/// The pixels of a side of `pictureLength` that a stretch of the screen covers.
Range covered(int start, int length, double scale, std::uint32_t pictureLength) {
    const int begin = static_cast<int>(std::floor(start * scale));
    const int end = static_cast<int>(std::ceil((start + length) * scale));
    return {std::max(begin, 0), std::min(end, static_cast<int>(pictureLength))};
}

}  // namespace

void blendCursor(const CursorImage& cursor, double scale, const VideoSurface::Geometry& geometry,
                 std::span<std::byte> picture) {
    const auto pixelCount = static_cast<std::size_t>(cursor.width) * static_cast<std::size_t>(cursor.height);
    if (cursor.width <= 0 || cursor.height <= 0 || cursor.pixels.size() < pixelCount) return;
    const Range columns = covered(cursor.left, cursor.width, scale, geometry.width);
    const Range rows = covered(cursor.top, cursor.height, scale, geometry.height);
    const auto sourceOf = [scale](int position, int start, int length) {
        return static_cast<std::size_t>(
            std::clamp(static_cast<int>(std::floor((position + 0.5) / scale)) - start, 0, length - 1));
    };
    for (int y = rows.begin; y < rows.end; ++y) {
        const std::size_t sourceRow =
            sourceOf(y, cursor.top, cursor.height) * static_cast<std::size_t>(cursor.width);
        std::byte* const row = picture.data() + static_cast<std::size_t>(y) * geometry.bytesPerRow;
        for (int x = columns.begin; x < columns.end; ++x) {
            std::uint32_t pixel = 0;
            std::byte* const place = row + static_cast<std::size_t>(x) * 4;
            std::memcpy(&pixel, place, sizeof pixel);
            pixel = over(cursor.pixels[sourceRow + sourceOf(x, cursor.left, cursor.width)], pixel);
            std::memcpy(place, &pixel, sizeof pixel);
        }
    }
}

}  // namespace kelvo::x11
