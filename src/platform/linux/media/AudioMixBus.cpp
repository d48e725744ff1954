#include "platform/linux/media/AudioMixBus.h"

#include <algorithm>

namespace kelvo {
namespace {

void limit(std::span<float> samples) {
    for (float& sample : samples)
        sample = std::clamp(sample, -1.0F, 1.0F);
}

}  // namespace

AudioMixBus::AudioMixBus(std::size_t trackCount, AlignedAudioSink& output) : output_(output) {
    for (std::size_t i = 0; i < trackCount; ++i)
        tracks_.emplace_back(*this);
    output_.begin(0);
}

OptionalError AudioMixBus::Track::samples(std::span<const float> left, std::span<const float> right) {
    bus_.add(end_, left, right);
    end_ += static_cast<std::int64_t>(left.size());
    return std::nullopt;
}

OptionalError AudioMixBus::Track::silence(std::int64_t count) {
    end_ += count;
    return std::nullopt;
}

void AudioMixBus::add(std::int64_t position, std::span<const float> left, std::span<const float> right) {
    if (position < position_) {
        // Too late: that part of the mix is encoded.
        const auto late = static_cast<std::size_t>(position_ - position);
        if (late >= left.size()) return;
        left = left.subspan(late);
        right = right.subspan(late);
        position = position_;
    }
    const auto offset = static_cast<std::size_t>(position - position_);
    if (left_.size() < offset + left.size()) {
        left_.resize(offset + left.size());
        right_.resize(offset + left.size());
    }
    for (std::size_t i = 0; i < left.size(); ++i) {
        left_[offset + i] += left[i];
        right_[offset + i] += right[i];
    }
}

OptionalError AudioMixBus::mixUntil(std::int64_t position) {
    std::int64_t reached = tracks_.front().end();
    for (const Track& track : tracks_)
        reached = std::min(reached, track.end());
    return encodeUntil(std::max(reached, position));
}

OptionalError AudioMixBus::flush() {
    std::int64_t end = position_;
    for (const Track& track : tracks_)
        end = std::max(end, track.end());
    return encodeUntil(end);
}

OptionalError AudioMixBus::encodeUntil(std::int64_t position) {
    if (position <= position_) return std::nullopt;
    const std::int64_t wanted = position - position_;
    const std::size_t held = std::min<std::size_t>(left_.size(), static_cast<std::size_t>(wanted));
    position_ = position;
    limit(std::span(left_).first(held));
    limit(std::span(right_).first(held));
    OptionalError error = output_.samples(std::span(left_).first(held), std::span(right_).first(held));
    left_.erase(left_.begin(), left_.begin() + static_cast<std::ptrdiff_t>(held));
    right_.erase(right_.begin(), right_.begin() + static_cast<std::ptrdiff_t>(held));
    const std::int64_t silent = wanted - static_cast<std::int64_t>(held);
    return error || silent == 0 ? error : output_.silence(silent);
}

}  // namespace kelvo
