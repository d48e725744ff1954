#pragma once

#include "support/media/MovieProbe.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <optional>
#include <string>
#include <vector>

namespace kelvo::test {

/// The times in seconds, since the movie's beginning, at which the picture turns from dark to bright.
inline std::vector<double> flashesIn(const std::string& path) {
    const std::vector<double> times = frameTimes(path, "v:0");
    const std::string pixels = outputOf("ffmpeg -nostdin -v error -i '" + path +
                                        "' -map 0:v:0 -fps_mode passthrough -enc_time_base -1 -vf "
                                        "scale=1:1:flags=area -pix_fmt gray -f rawvideo -");
    std::vector<double> flashes;
    bool wasBright = true;
    for (std::size_t i = 0; i < std::min(times.size(), pixels.size()); ++i) {
        const bool isBright = static_cast<unsigned char>(pixels[i]) > 128;
        if (isBright && !wasBright) flashes.push_back(times[i]);
        wasBright = isBright;
    }
    return flashes;
}

/// The times in seconds at which beeps begin in the movie's sound.
inline std::vector<double> beepsIn(const std::string& path, const std::string& stream) {
    constexpr double kRate = 44100;
    constexpr float kLoud = 0.2F;
    constexpr double kQuiet = 0.05;  // seconds before a beep
    const std::vector<float> sound = decodedSound(path, stream);
    std::vector<double> beeps;
    double loudUntil = -1;
    for (std::size_t i = 0; i < sound.size(); ++i) {
        if (std::abs(sound[i]) < kLoud) continue;
        const double time = static_cast<double>(i) / kRate;
        if (time - loudUntil > kQuiet) beeps.push_back(time);
        loudUntil = time;
    }
    return beeps;
}

/// The one of `moments` that lies next to `moment`, not further off than `reach`.
inline std::optional<double> nearest(const std::vector<double>& moments, double moment, double reach) {
    std::optional<double> found;
    for (const double each : moments) {
        const double distance = std::abs(each - moment);
        if (distance <= reach && (!found || distance < std::abs(*found - moment))) found = each;
    }
    return found;
}

}  // namespace kelvo::test
