#include "Tones.h"

#include <cmath>
#include <complex>
#include <numbers>

namespace kelvo::test {

double amplitudeOf(double frequency, std::span<const std::int16_t> samples) {
    constexpr double kRate = 44100;
    const auto count = static_cast<double>(samples.size());
    std::complex<double> sum = 0;
    double weights = 0;
    for (std::size_t i = 0; i < samples.size(); ++i) {
        const auto position = static_cast<double>(i);
        // A Blackman-Harris window: what lies next to the frequency must not leak into it.
        const double angle = 2 * std::numbers::pi * position / count;
        const double weight = 0.35875 - 0.48829 * std::cos(angle) + 0.14128 * std::cos(2 * angle) -
                              0.01168 * std::cos(3 * angle);
        sum += weight * samples[i] * std::polar(1.0, -2 * std::numbers::pi * frequency * position / kRate);
        weights += weight;
    }
    return weights > 0 ? 2 * std::abs(sum) / weights : 0;
}

double ratioInDecibels(double amplitude, double reference) {
    return 20 * std::log10(amplitude / reference);
}

}  // namespace kelvo::test
