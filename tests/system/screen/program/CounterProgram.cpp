#include "support/x11/XClient.h"

#include <chrono>
#include <cinttypes>
#include <cstdio>
#include <cstdlib>
#include <thread>

namespace {

std::int64_t now() {
    return std::chrono::nanoseconds(std::chrono::steady_clock::now().time_since_epoch()).count();
}

}  // namespace

/// counter_program DISPLAY WIDTH HEIGHT: counts in a window, 60 times a second, until it is killed. Standard
/// error tells which window, and of each value between which times of the host's monotonic clock it was
/// drawn.
int main(int argumentCount, char** arguments) {
    if (argumentCount != 4) return 2;
    kelvo::test::XClient client(arguments[1]);
    const auto window = client.createWindow({0, 0, std::atoi(arguments[2]), std::atoi(arguments[3])}, 0);
    client.movePointer(0, 0);
    std::fprintf(stderr, "window %" PRIu32 "\n", window);
    constexpr std::chrono::nanoseconds kInterval{1000000000 / 60};
    auto next = std::chrono::steady_clock::now();
    for (std::uint32_t number = 1;; ++number) {
        std::this_thread::sleep_until(next += kInterval);
        const std::int64_t begun = now();
        client.showNumber(window, number);
        std::fprintf(stderr, "drew %" PRIu32 " %" PRId64 " %" PRId64 "\n", number, begun, now());
    }
}
