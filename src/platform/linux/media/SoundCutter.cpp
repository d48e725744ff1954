#include "platform/linux/media/SoundCutter.h"

#include <algorithm>
#include <cmath>

namespace kelvo {
namespace {

constexpr std::int32_t kNanoseconds = 1000000000;

MediaTime inTime(double seconds) {
    return MediaTime::fromSeconds(seconds, kNanoseconds);
}

double lengthOf(const PcmBlock& block) {
    return static_cast<double>(block.sampleCount()) / block.sampleRate;
}

/// Which sample of `block` is the first one at or after `moment`; 0 and the count when all or none are.
std::size_t sampleAt(const PcmBlock& block, const MediaTime& begin, const MediaTime& moment) {
    const double sample = std::ceil((moment - begin).seconds() * block.sampleRate);
    // Written so that a moment that cannot be counted falls before the block.
    if (!(sample > 0)) return 0;
    return static_cast<std::size_t>(std::min(sample, static_cast<double>(block.sampleCount())));
}

}  // namespace

OptionalError SoundCutter::add(PcmBlock block, const MediaTime& captureTime, const MovieTimeline& timeline) {
    if (block.sampleCount() == 0 || !captureTime.isValid()) return std::nullopt;
    heldSeconds_ += lengthOf(block);
    held_.push_back({std::move(block), captureTime});
    const Stretches stretches = timeline.stretches();
    while (!held_.empty() && !mustWait(stretches)) {
        if (OptionalError error = handOverFirst(stretches)) return error;
    }
    return std::nullopt;
}

OptionalError SoundCutter::flush(const MovieTimeline& timeline) {
    const Stretches stretches = timeline.stretches();
    while (!held_.empty()) {
        if (OptionalError error = handOverFirst(stretches)) return error;
    }
    return std::nullopt;
}

bool SoundCutter::mustWait(const Stretches& stretches) const {
    if (stretches.empty()) return false;
    const Held& first = held_.front();
    const MediaTime lastFrame = stretches.back().lastFrame;
    const bool isBeforeAFrame = !(compare(first.begin, lastFrame) > 0);
    const MediaTime soundedUntil = end_.isValid() ? end_ : lastFrame;
    const bool goesOn = !((first.begin - soundedUntil).seconds() > kSilence);
    if (isBeforeAFrame || goesOn) return false;
    const double since = (held_.back().begin - first.begin).seconds();
    return heldSeconds_ < kPatience && since < kPatience;
}

OptionalError SoundCutter::handOverFirst(const Stretches& stretches) {
    const Held held = std::move(held_.front());
    held_.pop_front();
    const double length = lengthOf(held.block);
    heldSeconds_ = held_.empty() ? 0 : heldSeconds_ - length;
    end_ = held.begin + inTime(length);
    const std::size_t count = held.block.sampleCount();
    if (stretches.empty()) return handOverPart(held, {0, {}, {}, MediaTime::zero()}, 0, count);
    for (std::size_t i = 0; i < stretches.size(); ++i) {
        // Before the first frame of all lies the movie's beginning, where the sound is cut in any case.
        const std::size_t first = i == 0 ? 0 : sampleAt(held.block, held.begin, stretches[i].firstFrame);
        const bool isLast = i + 1 == stretches.size();
        const std::size_t last = isLast ? count : sampleAt(held.block, held.begin, stretches[i].lastFrame);
        if (OptionalError error = handOverPart(held, stretches[i], first, last)) return error;
    }
    return std::nullopt;
}

/// The samples from `first` to before `last`, which may be none.
OptionalError SoundCutter::handOverPart(const Held& held, const MovieTimeline::Stretch& stretch,
                                        std::size_t first, std::size_t last) {
    if (first >= last) return std::nullopt;
    const bool isSeam = stretch.number != std::exchange(stretchNumber_, stretch.number);
    const MediaTime offset = inTime(static_cast<double>(first) / held.block.sampleRate);
    return sink_(held.block.part(first, last - first), held.begin + offset - stretch.shift,
                 isSeam ? AudioAligner::Joint::exact : AudioAligner::Joint::smooth);
}

}  // namespace kelvo
