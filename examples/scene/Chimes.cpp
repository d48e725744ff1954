#include "Chimes.h"

#include <array>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <numbers>
#include <pulse/error.h>
#include <pulse/simple.h>

namespace scene {
namespace {

constexpr std::uint32_t kRate = 44100;
constexpr std::array<double, 8> kMelody{523.25, 659.25, 783.99, 880.00, 1046.50, 880.00, 783.99, 587.33};
constexpr int kNotesThatStillSound = 3;

/// A bell: three partials, of which the higher die away sooner.
double bell(double frequency, double age) {
    const double angle = 2 * std::numbers::pi * frequency * age;
    const double attack = std::min(1.0, age * 200);
    return attack *
           (0.24 * std::exp(-3 * age) * std::sin(angle) + 0.08 * std::exp(-5 * age) * std::sin(2 * angle) +
            0.04 * std::exp(-9 * age) * std::sin(3 * angle));
}

double soundAt(double time) {
    const auto latest = static_cast<int>(time / kBouncePeriod);
    double sum = 0;
    for (int note = std::max(0, latest - kNotesThatStillSound); note <= latest; ++note)
        sum += bell(kMelody[static_cast<std::size_t>(note) % kMelody.size()], time - note * kBouncePeriod);
    return sum;
}

}  // namespace

Chimes::Chimes() : player_([this] { play(); }) {}

Chimes::~Chimes() {
    isOver_ = true;
    player_.join();
}

void Chimes::play() const {
    const pa_sample_spec format{PA_SAMPLE_S16NE, kRate, 1};
    const pa_buffer_attr buffer{kRate / 5, kRate / 10, kRate / 10, UINT32_MAX, UINT32_MAX};
    int error = 0;
    const std::unique_ptr<pa_simple, decltype(&pa_simple_free)> stream(
        pa_simple_new(nullptr, "Moving scene", PA_STREAM_PLAYBACK, nullptr, "Chimes", &format, nullptr,
                      &buffer, &error),
        &pa_simple_free);
    if (!stream) {
        std::fprintf(stderr, "silent: %s\n", pa_strerror(error));
        return;
    }
    std::array<std::int16_t, kRate / 50> piece{};
    for (std::uint64_t played = 0; !isOver_; played += piece.size()) {
        for (std::size_t i = 0; i < piece.size(); ++i)
            piece[i] = static_cast<std::int16_t>(
                std::lround(32767 * soundAt(static_cast<double>(played + i) / kRate)));
        if (pa_simple_write(stream.get(), piece.data(), sizeof(piece), &error) < 0) return;
    }
}

}  // namespace scene
