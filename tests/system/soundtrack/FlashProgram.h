#pragma once

#include "support/ChildProcess.h"

#include <chrono>
#include <csignal>
#include <map>
#include <sstream>
#include <string>
#include <vector>

namespace kelvo::test {

/// A program of its own that lets the screen flash and beeps at the same instant, again and again.
class FlashProgram {
  public:
    using Time = std::chrono::nanoseconds;  ///< on the host's monotonic clock

    struct Flash {
        Time promised;  ///< when the server said that the beep would be heard
        Time begun;     ///< the drawing
        Time done;

        /// Whether the program and the servers kept the promise themselves.
        bool isPunctual = false;
    };

    FlashProgram(const std::string& display, int width, int height, std::chrono::milliseconds interval)
        : process_({FLASH_PROGRAM, display, std::to_string(width), std::to_string(height),
                    std::to_string(interval.count())}) {
        process_.waitForLine("ready");
    }

    pid_t processIdentifier() const { return process_.processIdentifier(); }

    /// Ends the program; every flash that it told of.
    std::vector<Flash> stop() {
        process_.signal(SIGKILL);
        process_.waitForExit();
        std::map<int, Flash> flashes;
        std::map<int, Time> corrections;
        std::istringstream lines(process_.output());
        std::string line;
        while (std::getline(lines, line)) {
            std::istringstream words(line);
            std::string verb;
            int number = 0;
            Time::rep first = 0;
            Time::rep second = 0;
            if (!(words >> verb >> number >> first >> second)) continue;
            if (verb == "beep") {
                flashes[number].promised = Time(first);
                corrections[number] = Time(second - first);
            } else {
                flashes[number].begun = Time(first);
                flashes[number].done = Time(second);
            }
        }
        std::vector<Flash> complete;
        for (auto& [number, flash] : flashes) {
            if (flash.done == Time(0) || flash.promised == Time(0)) continue;
            flash.isPunctual = std::chrono::abs(corrections[number]) <= kPunctuality &&
                               flash.done - flash.promised <= kPunctuality;
            complete.push_back(flash);
        }
        return complete;
    }

  private:
    static constexpr std::chrono::milliseconds kPunctuality{3};

    ChildProcess process_;
};

}  // namespace kelvo::test
