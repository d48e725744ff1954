#include "base/MovieTimeline.h"

#include <iterator>

namespace kelvo {

void MovieTimeline::relate(const MediaTime& captureTime, const MediaTime& sourceTime) {
    const MediaTime shift = captureTime - sourceTime;
    if (!shift.isValid()) return;
    stretches_.with([&](std::vector<Stretch>& stretches) {
        if (!stretches.empty() && compare(stretches.back().shift, shift) == 0) {
            stretches.back().lastFrame = captureTime;
            return;
        }
        if (stretches.size() == kMostStretches) stretches.erase(stretches.begin());
        const int number = stretches.empty() ? 0 : stretches.back().number + 1;
        stretches.push_back({number, captureTime, captureTime, shift});
    });
}

MediaTime MovieTimeline::sourceTime(const MediaTime& captureTime) const {
    return stretches_.with([&](const std::vector<Stretch>& stretches) {
        if (stretches.empty()) return captureTime;
        auto stretch = stretches.rbegin();
        while (std::next(stretch) != stretches.rend() && compare(captureTime, stretch->firstFrame) < 0)
            ++stretch;
        const bool isCutOut = stretch != stretches.rbegin() && compare(captureTime, stretch->lastFrame) > 0;
        return isCutOut ? MediaTime::invalid() : captureTime - stretch->shift;
    });
}

bool MovieTimeline::isBehindTheFrames(const MediaTime& captureTime) const {
    return captureTime.isValid() && stretches_.with([&](const std::vector<Stretch>& stretches) {
        return !stretches.empty() && compare(captureTime, stretches.back().lastFrame) > 0;
    });
}

}  // namespace kelvo
