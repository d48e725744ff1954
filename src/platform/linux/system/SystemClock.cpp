#include "platform/linux/system/SystemClock.h"

#include <ctime>

namespace kelvo {
namespace {

std::int64_t nanosecondsOf(clockid_t clock) {
    timespec time{};
    ::clock_gettime(clock, &time);
    return time.tv_sec * 1000000000LL + time.tv_nsec;
}

}  // namespace

Date SystemClock::now() const {
    return {nanosecondsOf(CLOCK_REALTIME)};
}

std::chrono::nanoseconds SystemClock::monotonicNow() const {
    return std::chrono::nanoseconds(nanosecondsOf(CLOCK_MONOTONIC));
}

}  // namespace kelvo
