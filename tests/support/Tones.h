#pragma once

#include <cstdint>
#include <span>

namespace kelvo::test {

/// How strongly `frequency` Hz sounds in `samples` (mono, 44100 Hz): the amplitude of that sine, full scale
/// being 32768. Half a second of sound separates tones that are a few hertz apart by 90 dB and more.
double amplitudeOf(double frequency, std::span<const std::int16_t> samples);

/// In decibels.
double ratioInDecibels(double amplitude, double reference);

}  // namespace kelvo::test
