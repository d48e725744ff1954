#include "base/Date.h"

#include <array>
#include <cmath>
#include <ctime>

namespace kelvo {

Date Date::fromSecondsSince1970(double seconds) {
    return {static_cast<std::int64_t>(std::llround(seconds * 1e9))};
}

double Date::secondsSince1970() const {
    return static_cast<double>(nanosecondsSince1970) / 1e9;
}

std::string localTimeText(Date date, const char* pattern) {
    const std::time_t seconds =
        std::chrono::floor<std::chrono::seconds>(std::chrono::nanoseconds(date.nanosecondsSince1970)).count();
    std::tm local{};
    ::localtime_r(&seconds, &local);
    std::array<char, 256> text{};
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"  // the pattern is the caller's; it comes from our code
    const std::size_t length = std::strftime(text.data(), text.size(), pattern, &local);
#pragma GCC diagnostic pop
    return {text.data(), length};
}

}  // namespace kelvo
