#pragma once

#include "support/ChildProcess.h"

#include <chrono>
#include <csignal>
#include <cstdint>
#include <sstream>
#include <string>
#include <vector>
#include <xcb/xcb.h>

namespace kelvo::test {

/// A program of its own that draws a counter into a window, 60 values a second, and notes when it did.
class CounterProgram {
  public:
    using Time = std::chrono::nanoseconds;  ///< on the host's monotonic clock

    /// Value `number` was drawn between these two times.
    struct Drawing {
        std::uint32_t number;
        Time begun;
        Time done;
    };

    CounterProgram(const std::string& display, int width, int height)
        : process_({COUNTER_PROGRAM, display, std::to_string(width), std::to_string(height)}) {
        if (process_.waitForLine("window ")) std::istringstream(process_.output().substr(7)) >> window_;
    }

    xcb_window_t window() const { return window_; }

    /// Ends the program; everything it drew.
    std::vector<Drawing> stop() {
        process_.signal(SIGTERM);
        process_.waitForExit();
        std::vector<Drawing> drawings;
        std::istringstream lines(process_.output());
        std::string line;
        while (std::getline(lines, line)) {
            std::istringstream words(line);
            std::string verb;
            std::uint32_t number = 0;
            Time::rep begun = 0;
            Time::rep done = 0;
            if (words >> verb >> number >> begun >> done)
                drawings.push_back({number, Time(begun), Time(done)});
        }
        return drawings;
    }

    static Time now() { return std::chrono::steady_clock::now().time_since_epoch(); }

  private:
    ChildProcess process_;
    xcb_window_t window_ = 0;
};

}  // namespace kelvo::test
