#pragma once

#include <compare>
#include <cstddef>
#include <cstdint>

namespace kelvo {

/// A rational timestamp: value / timescale seconds. Plain data that crosses process boundaries as its 24
/// bytes.
///
/// A time that is not valid means "not set". Operators on raw values (subtracting one `value` from another)
/// are for streams of one timescale; the functions below convert.
struct MediaTime {
    static constexpr std::uint32_t kValidFlag = 1U << 0;

    std::int64_t value = 0;
    std::int32_t timescale = 0;  ///< Units per second, positive in a valid time.
    std::uint32_t flags = 0;     ///< Bit 0: the time is valid.
    std::int64_t epoch = 0;      ///< Distinguishes timelines that share numbers; 0 throughout this system.

    static constexpr MediaTime make(std::int64_t value, std::int32_t timescale) {
        return {value, timescale, timescale > 0 ? kValidFlag : 0, 0};
    }
    static constexpr MediaTime zero() { return make(0, 1); }
    static constexpr MediaTime invalid() { return {}; }

    /// `seconds` rounded to the nearest unit of `timescale`, halves away from zero. Invalid when `seconds` is
    /// not a number or does not fit.
    static MediaTime fromSeconds(double seconds, std::int32_t timescale);

    constexpr bool isValid() const { return (flags & kValidFlag) != 0 && timescale > 0; }
    constexpr bool isZero() const { return isValid() && value == 0; }

    /// NaN for an invalid time.
    double seconds() const;

    /// The same time in another timescale, rounded to the nearest unit; invalid when it does not fit.
    MediaTime convertedTo(std::int32_t newTimescale) const;

    /// Field by field: 1/1 and 2/2 differ. Use `compare` for order on the time line.
    friend bool operator==(const MediaTime&, const MediaTime&) = default;
};

/// Sum and difference. The result has the common timescale where both agree, else their least common multiple
/// where that fits, else the finer of the two. Invalid when an operand is invalid or the result does not fit.
MediaTime operator+(const MediaTime& left, const MediaTime& right);
MediaTime operator-(const MediaTime& left, const MediaTime& right);

/// Order on the time line, whatever the timescales. Unordered when either is invalid.
std::partial_ordering compare(const MediaTime& left, const MediaTime& right);

static_assert(sizeof(MediaTime) == 24);
static_assert(offsetof(MediaTime, value) == 0);
static_assert(offsetof(MediaTime, timescale) == 8);
static_assert(offsetof(MediaTime, flags) == 12);
static_assert(offsetof(MediaTime, epoch) == 16);

}  // namespace kelvo
