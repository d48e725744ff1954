#pragma once

#include "platform/simulated/NumberedPicture.h"
#include "support/media/MovieProbe.h"

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace kelvo::test {

/// One frame of a movie of a counter.
struct CounterFrame {
    std::optional<std::uint32_t> number;
    double seconds;  ///< since the movie's beginning
};

/// Every frame of the movie, decoded by a program that is not ours. `cut` is the part of the frame in which
/// the counter is, as that program's crop filter takes it; all of it when empty.
inline std::vector<CounterFrame> readCounterMovie(const std::string& path, const std::string& cut = {}) {
    constexpr std::uint32_t kWidth = 80;
    constexpr std::uint32_t kHeight = 50;
    const std::vector<double> times = frameTimes(path, "v:0");
    const std::string pixels = outputOf(
        "ffmpeg -v error -i '" + path + "' -map 0:v:0 -fps_mode passthrough -enc_time_base -1 -vf " +
        (cut.empty() ? "" : "crop=" + cut + ",") + "scale=80:50:flags=area -pix_fmt gray -f rawvideo -");
    std::vector<CounterFrame> frames;
    for (std::size_t i = 0; i < times.size() && (i + 1) * kWidth * kHeight <= pixels.size(); ++i) {
        const auto* const picture =
            reinterpret_cast<const unsigned char*>(pixels.data()) + i * kWidth * kHeight;
        const auto number = NumberedPicture::read(
            kWidth, kHeight, [&](std::uint32_t x, std::uint32_t y) { return int{picture[y * kWidth + x]}; });
        frames.push_back({number, times[i]});
    }
    return frames;
}

/// Whether any pixel of any frame is clearly green.
inline bool showsGreen(const std::string& path) {
    const std::string pixels =
        outputOf("ffmpeg -v error -i '" + path +
                 "' -map 0:v:0 -fps_mode passthrough -enc_time_base -1 -pix_fmt rgb24 -f rawvideo -");
    for (std::size_t i = 0; i + 2 < pixels.size(); i += 3) {
        const auto at = [&](std::size_t index) { return int{static_cast<unsigned char>(pixels[index])}; };
        if (at(i + 1) > std::max(at(i), at(i + 2)) + 60) return true;
    }
    return false;
}

}  // namespace kelvo::test
