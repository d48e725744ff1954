#include "platform/linux/media/AudioAligner.h"

#include <algorithm>
#include <array>
#include <cmath>

namespace kelvo {
namespace {

constexpr double kLongestGap = 24 * 60 * 60;  // seconds
/// A difference as large as this is a gap or an overlap, not a clock; in seconds. Below the 15 ms that
/// picture and sound may be apart.
constexpr double kGap = 0.012;
/// Smaller differences are left alone, so that the resampler mostly runs at its plain rate; in seconds.
constexpr double kTolerance = 0.001;
constexpr double kSmoothing = 0.1;         // the weight of one block's difference
constexpr double kMostStretching = 0.005;  // of the rate: not audible
/// Longer than the resampler's memory, in samples.
constexpr std::size_t kTail = 128;

}  // namespace

AudioAligner::AudioAligner(int sampleRate, AlignedAudioSink& sink) : sampleRate_(sampleRate), sink_(sink) {}

OptionalError AudioAligner::add(PcmBlock block, double seconds, Joint joint) {
    const double wanted = seconds * sampleRate_;
    if (!(std::abs(seconds) <= kLongestGap) || block.sampleCount() == 0) return std::nullopt;
    if (OptionalError error = prepareResampler(block)) return error;
    if (!position_) return beginAt(block, wanted);
    if (wanted - inputPosition() > kLongestGap * sampleRate_) return std::nullopt;
    if (joint == Joint::exact) stopFollowing();
    const double difference = wanted - inputPosition();
    const double gap = joint == Joint::exact ? 0.5 : kGap * sampleRate_;
    if (difference <= -gap || (isCutting_ && difference < 0)) {
        cut(block, -difference);
        return resample(block);
    }
    isCutting_ = false;
    if (difference < gap) {
        follow(difference);
    } else if (OptionalError error = fillGap(std::llround(difference))) {
        return error;
    }
    return resample(block);
}

/// Drops `count` samples (of the output's rate) from the front. An overlap that takes a whole block goes on
/// in the next, down to its last sample.
void AudioAligner::cut(PcmBlock& block, double count) {
    const auto cutSamples = static_cast<std::size_t>(std::llround(count * inputRate_ / sampleRate_));
    isCutting_ = cutSamples >= block.sampleCount();
    block.dropFirst(cutSamples);
    stopFollowing();
}

OptionalError AudioAligner::beginAt(PcmBlock& block, double position) {
    if (position < 0) {
        cut(block, -position);
        position = 0;
    }
    if (block.sampleCount() == 0) return std::nullopt;
    position_ = std::llround(position);
    sink_.begin(*position_);
    return resample(block);
}

/// Makes the resampler, anew when the input's format changed. Its history ends with the old format's sound.
OptionalError AudioAligner::prepareResampler(const PcmBlock& block) {
    const int rate = static_cast<int>(std::lround(block.sampleRate));
    if (resampler_ && rate == inputRate_ && block.channels.size() == inputChannels_) return std::nullopt;
    if (resampler_ && position_) {
        if (OptionalError error = resampleSilence(kTail)) return error;
    }
    AVChannelLayout input{};
    AVChannelLayout output = AV_CHANNEL_LAYOUT_STEREO;
    av_channel_layout_default(&input, static_cast<int>(block.channels.size()));
    SwrContext* context = nullptr;
    int result = swr_alloc_set_opts2(&context, &output, AV_SAMPLE_FMT_FLTP, sampleRate_, &input,
                                     AV_SAMPLE_FMT_FLTP, rate, 0, nullptr);
    resampler_.reset(context);
    // Even at equal rates the resampler must be there to follow the clock.
    if (result >= 0) result = av_opt_set(context, "flags", "+res", 0);
    if (result >= 0) result = swr_init(context);
    if (result < 0) {
        resampler_.reset();
        return lavError(result, kMediaErrorUnsupportedFormat, "resampler");
    }
    inputRate_ = rate;
    inputChannels_ = block.channels.size();
    smoothedDifference_ = 0;
    return std::nullopt;
}

double AudioAligner::inputPosition() const {
    // In the finest unit, that of both rates, nothing is lost to rounding.
    const std::int64_t unit = std::int64_t{inputRate_} * sampleRate_;
    const auto delay = static_cast<double>(swr_get_delay(resampler_.get(), unit));
    return static_cast<double>(*position_) + delay / inputRate_;
}

OptionalError AudioAligner::fillGap(std::int64_t count) {
    stopFollowing();
    const double end = inputPosition() + static_cast<double>(count);
    const double gapInput = static_cast<double>(count) * inputRate_ / sampleRate_;
    if (OptionalError error = resampleSilence(std::min(kTail, static_cast<std::size_t>(gapInput))))
        return error;
    // After more than that the resampler now remembers only silence, so more of it need not go through it.
    const std::int64_t left = std::llround(end - inputPosition());
    if (left <= 0) return std::nullopt;
    *position_ += left;
    return sink_.silence(left);
}

/// Aims at having made up for the difference a second from now.
void AudioAligner::follow(double difference) {
    smoothedDifference_ += kSmoothing * (difference - smoothedDifference_);
    if (std::abs(smoothedDifference_) < kTolerance * sampleRate_) return;
    const double most = kMostStretching * sampleRate_;
    const int samples = static_cast<int>(std::lround(std::clamp(smoothedDifference_, -most, most)));
    static_cast<void>(swr_set_compensation(resampler_.get(), samples, sampleRate_));
}

void AudioAligner::stopFollowing() {
    smoothedDifference_ = 0;
    static_cast<void>(swr_set_compensation(resampler_.get(), 0, 0));
}

OptionalError AudioAligner::resampleSilence(std::size_t count) {
    PcmBlock silence{static_cast<double>(inputRate_), {}};
    silence.channels.assign(inputChannels_, std::vector<float>(count));
    return resample(silence);
}

OptionalError AudioAligner::resample(const PcmBlock& block) {
    const auto count = static_cast<int>(block.sampleCount());
    if (count == 0) return std::nullopt;
    std::array<const std::uint8_t*, 8> input{};
    for (std::size_t i = 0; i < block.channels.size(); ++i)
        input[i] = reinterpret_cast<const std::uint8_t*>(block.channels[i].data());
    const int room = swr_get_out_samples(resampler_.get(), count);
    if (room < 0) return lavError(room, kMediaErrorEncodingFailed, "resampler");
    left_.resize(static_cast<std::size_t>(room));
    right_.resize(static_cast<std::size_t>(room));
    std::array<std::uint8_t*, 2> output{reinterpret_cast<std::uint8_t*>(left_.data()),
                                        reinterpret_cast<std::uint8_t*>(right_.data())};
    const int made = swr_convert(resampler_.get(), output.data(), room, input.data(), count);
    if (made < 0) return lavError(made, kMediaErrorEncodingFailed, "resampler");
    *position_ += made;
    const auto size = static_cast<std::size_t>(made);
    return sink_.samples(std::span(left_).first(size), std::span(right_).first(size));
}

OptionalError AudioAligner::flush() {
    if (!position_) return std::nullopt;
    // Only as much silence goes in as brings the last sound out.
    const double delay = inputPosition() - static_cast<double>(*position_);
    return resampleSilence(static_cast<std::size_t>(std::ceil(delay * inputRate_ / sampleRate_)));
}

}  // namespace kelvo
