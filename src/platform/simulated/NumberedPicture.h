#pragma once

#include "base/VideoSurface.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>

namespace kelvo {

/// A picture of black and white blocks that spells a number, so that a test can tell every single frame from
/// every other, also after it went through a video encoder. The blocks fill the picture whatever its size,
/// which is at least 16 by 10 pixels.
class NumberedPicture {
  public:
    static constexpr std::uint32_t kColumns = 8;
    static constexpr std::uint32_t kRows = 5;

    /// Whether the block is white, for every block, row by row.
    using Blocks = std::array<bool, std::size_t{kColumns} * kRows>;
    static Blocks blocks(std::uint32_t number);

    static void draw(std::uint32_t number, const VideoSurface::Geometry& geometry,
                     std::span<std::byte> pixels);

    /// The brightness, 0 to 255, of the pixel at (x, y).
    using Brightness = std::function<int(std::uint32_t x, std::uint32_t y)>;

    /// The number that a picture spells; none for any other picture, such as one that is half drawn.
    static std::optional<std::uint32_t> read(std::uint32_t width, std::uint32_t height,
                                             const Brightness& brightness);
    static std::optional<std::uint32_t> read(const VideoSurface& surface);
};

}  // namespace kelvo
