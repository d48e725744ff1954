#include "base/MediaTime.h"

#include <cmath>
#include <limits>
#include <numeric>

namespace kelvo {
namespace {

__extension__ using Wide = __int128;

/// value * numerator / denominator, rounded to nearest, halves away from zero.
Wide scaleRounded(Wide value, Wide numerator, Wide denominator) {
    const Wide product = value * numerator;
    const Wide half = denominator / 2;
    return (product >= 0 ? product + half : product - half) / denominator;
}

MediaTime narrowed(Wide value, std::int32_t timescale, std::int64_t epoch) {
    if (value > std::numeric_limits<std::int64_t>::max() ||
        value < std::numeric_limits<std::int64_t>::min()) {
        return MediaTime::invalid();
    }
    MediaTime time = MediaTime::make(static_cast<std::int64_t>(value), timescale);
    time.epoch = epoch;
    return time;
}

std::int32_t commonTimescale(std::int32_t left, std::int32_t right) {
    const std::int64_t multiple = std::lcm(std::int64_t{left}, std::int64_t{right});
    if (multiple <= std::numeric_limits<std::int32_t>::max()) return static_cast<std::int32_t>(multiple);
    return std::max(left, right);
}

MediaTime combined(const MediaTime& left, const MediaTime& right, int sign) {
    if (!left.isValid() || !right.isValid()) return MediaTime::invalid();
    const std::int32_t scale = commonTimescale(left.timescale, right.timescale);
    const Wide leftValue = scaleRounded(left.value, scale, left.timescale);
    const Wide rightValue = scaleRounded(right.value, scale, right.timescale);
    return narrowed(leftValue + sign * rightValue, scale, left.epoch);
}

}  // namespace

MediaTime MediaTime::fromSeconds(double seconds, std::int32_t timescale) {
    const double units = std::round(seconds * timescale);
    constexpr double kLimit = 9.2e18;  // just inside the range of the 64-bit value
    if (!(std::abs(units) < kLimit) || timescale <= 0) return invalid();
    return make(static_cast<std::int64_t>(units), timescale);
}

double MediaTime::seconds() const {
    if (!isValid()) return std::numeric_limits<double>::quiet_NaN();
    return static_cast<double>(value) / timescale;
}

MediaTime MediaTime::convertedTo(std::int32_t newTimescale) const {
    if (!isValid() || newTimescale <= 0) return invalid();
    return narrowed(scaleRounded(value, newTimescale, timescale), newTimescale, epoch);
}

MediaTime operator+(const MediaTime& left, const MediaTime& right) {
    return combined(left, right, 1);
}
MediaTime operator-(const MediaTime& left, const MediaTime& right) {
    return combined(left, right, -1);
}

std::partial_ordering compare(const MediaTime& left, const MediaTime& right) {
    if (!left.isValid() || !right.isValid()) return std::partial_ordering::unordered;
    const Wide difference = Wide{left.value} * right.timescale - Wide{right.value} * left.timescale;
    if (difference == 0) return std::partial_ordering::equivalent;
    return difference < 0 ? std::partial_ordering::less : std::partial_ordering::greater;
}

}  // namespace kelvo
