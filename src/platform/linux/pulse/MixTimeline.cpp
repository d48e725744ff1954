#include "platform/linux/pulse/MixTimeline.h"

#include "platform/linux/pulse/StreamClock.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <limits>

namespace kelvo::pulse {
namespace {

std::int16_t clipped(std::int32_t sum) {
    return static_cast<std::int16_t>(std::clamp<std::int32_t>(sum, std::numeric_limits<std::int16_t>::min(),
                                                              std::numeric_limits<std::int16_t>::max()));
}

std::uint16_t inByteOrder(std::int16_t sample, bool isBigEndian) {
    const auto bits = static_cast<std::uint16_t>(sample);
    if (!isBigEndian) return bits;
    return static_cast<std::uint16_t>(bits << 8 | bits >> 8);
}

}  // namespace

MixTimeline::MixTimeline(std::chrono::nanoseconds start, std::uint32_t rate, std::uint32_t channels)
    : start_(start), rate_(rate), channels_(channels), capacity_(kReach.count() * rate) {
    state_.with([&](State& state) { state.sums.resize(static_cast<std::size_t>(capacity_) * channels); });
}

std::int64_t MixTimeline::frameAt(std::chrono::nanoseconds moment) const {
    return framesIn(moment - start_, rate_);
}

MixTimeline::StreamIndex MixTimeline::addStream(std::chrono::nanoseconds now) {
    return state_.with([&](State& state) {
        const auto free = std::ranges::find_if(state.streams, [](const Stream& s) { return !s.isUsed; });
        if (free == state.streams.end()) return kNoStream;
        *free = {true, false, std::max(frameAt(now), state.next)};
        return static_cast<StreamIndex>(free - state.streams.begin());
    });
}

void MixTimeline::removeStream(StreamIndex stream) {
    if (stream >= kMostStreams) return;
    state_.with([&](State& state) { state.streams[stream].isUsed = false; });
}

void MixTimeline::write(StreamIndex stream, std::chrono::nanoseconds moment,
                        std::span<const std::int16_t> samples) {
    if (stream >= kMostStreams || samples.size() < channels_) return;
    state_.with([&](State& state) {
        Stream& writer = state.streams[stream];
        const std::int64_t begin = frameAt(moment);
        const std::int64_t distance = begin - writer.end;
        const bool follows = writer.hasSounded && std::abs(distance) <= framesIn(kSlack, rate_);
        // A single frame more or less in a block is not heard; a seam would be. Nobody sees whether sound is
        // a few milliseconds off, so that the server's jitter need not move it.
        const std::int64_t tolerated = rate_ / 250;
        const std::int64_t lengthens = !follows || std::abs(distance) <= tolerated ? 0
                                       : distance > 0                              ? 1
                                                                                   : -1;
        const std::int64_t position = follows ? writer.end : begin;
        const auto frames = static_cast<std::int64_t>(samples.size() / channels_);
        // Whatever put the stream that far ahead was wrong: it would be silent until the time has come.
        if (distance < -framesIn(kLongestOverlap, rate_)) writer.hasSounded = false;
        // A stream that falls back does not sound twice at once.
        const std::int64_t overlap = std::clamp<std::int64_t>(writer.end - position, 0, frames);
        const std::int64_t skipped = writer.hasSounded ? overlap : 0;
        mix(state, position + skipped, samples.subspan(static_cast<std::size_t>(skipped) * channels_),
            lengthens);
        const std::int64_t end = position + frames + lengthens;
        writer.end = writer.hasSounded ? std::max(writer.end, end) : end;
        writer.hasSounded = true;
    });
}

void MixTimeline::mix(State& state, std::int64_t frame, std::span<const std::int16_t> samples,
                      std::int64_t lengthens) const {
    const std::size_t frames = samples.size() / channels_;
    if (frames == 0) return;
    const std::size_t kept = lengthens < 0 ? frames - 1 : frames;
    for (std::size_t i = 0; i < kept; ++i, ++frame)
        mixFrame(state, frame, samples.subspan(i * channels_, channels_));
    if (lengthens > 0) mixFrame(state, frame, samples.subspan((frames - 1) * channels_, channels_));
}

void MixTimeline::mixFrame(State& state, std::int64_t frame, std::span<const std::int16_t> samples) const {
    if (frame < state.next || frame >= state.next + capacity_) return;
    std::int32_t* sum = &state.sums[static_cast<std::size_t>(frame % capacity_) * channels_];
    for (std::uint32_t channel = 0; channel < channels_; ++channel)
        sum[channel] += samples[channel];
}

std::int64_t MixTimeline::readableFrames(std::chrono::nanoseconds now) const {
    return state_.with([&](const State& state) {
        std::int64_t end = frameAt(now - kSettling);
        for (const Stream& stream : state.streams) {
            if (stream.isUsed) end = std::min(end, stream.end);
        }
        return std::max<std::int64_t>(std::max(end, frameAt(now - kPatience)) - state.next, 0);
    });
}

std::chrono::nanoseconds MixTimeline::position() const {
    return start_ + durationOf(framesRead(), rate_);
}

std::int64_t MixTimeline::framesRead() const {
    return state_.with([](const State& state) { return state.next; });
}

void MixTimeline::read(std::span<std::byte> bytes, bool isBigEndian) {
    state_.with([&](State& state) {
        const std::size_t frameSize = channels_ * sizeof(std::int16_t);
        for (std::size_t offset = 0; offset + frameSize <= bytes.size(); offset += frameSize, ++state.next) {
            std::int32_t* sum = &state.sums[static_cast<std::size_t>(state.next % capacity_) * channels_];
            for (std::uint32_t channel = 0; channel < channels_; ++channel) {
                const std::uint16_t sample = inByteOrder(clipped(sum[channel]), isBigEndian);
                std::memcpy(&bytes[offset + channel * sizeof(sample)], &sample, sizeof(sample));
                sum[channel] = 0;
            }
        }
    });
}

}  // namespace kelvo::pulse
