#pragma once

#include "support/x11/XClient.h"

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <string>
#include <thread>
#include <vector>

namespace kelvo::test {

/// A program that draws a counter into a window, so many pictures a second, and notes when it did.
class CounterProgram {
  public:
    using Time = std::chrono::nanoseconds;  ///< on the host's monotonic clock

    /// Value `number` was drawn between these two times.
    struct Drawing {
        std::uint32_t number;
        Time begun;
        Time done;
    };

    CounterProgram(const std::string& display, const XClient::Place& place) : client_(display) {
        window_ = client_.createWindow(place, 0);
        client_.movePointer(0, 0);
    }

    xcb_window_t window() const { return window_; }
    XClient& client() { return client_; }

    /// Draws for that long, on the calling thread.
    void run(std::chrono::milliseconds duration, Time interval) {
        const Time end = now() + duration;
        for (Time next = now(); next < end; next += interval) {
            std::this_thread::sleep_until(std::chrono::steady_clock::time_point(next));
            const Time begun = now();
            client_.showNumber(window_, ++number_);
            drawings_.push_back({number_, begun, now()});
        }
        std::this_thread::sleep_for(interval);  // the last value's turn
    }

    const std::vector<Drawing>& drawings() const { return drawings_; }

    static Time now() { return std::chrono::steady_clock::now().time_since_epoch(); }

  private:
    XClient client_;
    xcb_window_t window_;
    std::uint32_t number_ = 0;
    std::vector<Drawing> drawings_;
};

}  // namespace kelvo::test
