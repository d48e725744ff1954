#pragma once

#include <chrono>
#include <compare>
#include <cstdint>
#include <string>

namespace kelvo {

/// A moment of wall-clock time, in nanoseconds since 1 January 1970 UTC.
struct Date {
    std::int64_t nanosecondsSince1970 = 0;

    static Date fromSecondsSince1970(double seconds);
    double secondsSince1970() const;

    friend auto operator<=>(const Date&, const Date&) = default;
};

/// How long after `earlier` the moment `later` is; negative when it is before.
inline std::chrono::nanoseconds operator-(Date later, Date earlier) {
    return std::chrono::nanoseconds(later.nanosecondsSince1970 - earlier.nanosecondsSince1970);
}
inline Date operator+(Date date, std::chrono::nanoseconds interval) {
    return {date.nanosecondsSince1970 + interval.count()};
}

/// Seconds as a double, the unit in which most of this system speaks of intervals.
inline double inSeconds(std::chrono::nanoseconds interval) {
    return std::chrono::duration<double>(interval).count();
}

/// `date` in the local time zone, written with a strftime pattern such as "%m-%d-%Y %H:%M:%S". Empty when the
/// pattern yields more than 255 bytes. Thread-safe.
std::string localTimeText(Date date, const char* pattern);

}  // namespace kelvo
