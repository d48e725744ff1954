#include "platform/linux/storage/SpaceWatch.h"

namespace kelvo {

PurgeUrgency SpaceWatch::urgencyFor(std::uint64_t freeBytes) {
    if (freeBytes < kLowestBound) return 3;
    if (freeBytes < kLowerBound) return 2;
    return freeBytes < kLowBound ? 1 : 0;
}

void SpaceWatch::look(std::uint64_t freeBytes, std::chrono::nanoseconds now) {
    const PurgeUrgency urgency = urgencyFor(freeBytes);
    if (urgency > urgency_ || (urgency > 0 && now - lastPurge_ >= kRepeat)) {
        purge(urgency, now);
    } else if (urgency == 0 && urgency_ > 0) {
        callbacks_.cancel(lastFreed_);
    }
    urgency_ = urgency;
    if (now - lastPeriodic_ >= kPeriod) {
        lastPeriodic_ = now;
        callbacks_.periodic();
    }
}

void SpaceWatch::purge(PurgeUrgency urgency, std::chrono::nanoseconds now) {
    lastPurge_ = now;
    callbacks_.purgeableSpace(urgency);
    lastFreed_ = callbacks_.purge(urgency);
}

}  // namespace kelvo
