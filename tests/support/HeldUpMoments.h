#pragma once

#include <algorithm>
#include <chrono>
#include <thread>
#include <vector>

namespace kelvo::test {

/// Notes when this machine held everyone up: a thread that wants to run every millisecond and was not let.
/// What happens in such a moment says nothing about the program under test.
class HeldUpMoments {
  public:
    using Time = std::chrono::nanoseconds;  ///< on the host's monotonic clock

    HeldUpMoments() : watcher_([this](const std::stop_token& token) { watch(token); }) {}

    /// Whether one of them touches this stretch of time. After `stop`.
    bool touch(Time begin, Time end) const {
        return std::ranges::any_of(
            moments_, [&](const Moment& moment) { return moment.begin < end && moment.end > begin; });
    }
    void stop() {
        watcher_.request_stop();
        watcher_.join();
    }

  private:
    static constexpr std::chrono::milliseconds kTurn{1};
    static constexpr std::chrono::milliseconds kLongest{3};
    struct Moment {
        Time begin;
        Time end;
    };

    void watch(const std::stop_token& token) {
        while (!token.stop_requested()) {
            const Time begin = std::chrono::steady_clock::now().time_since_epoch();
            std::this_thread::sleep_for(kTurn);
            const Time end = std::chrono::steady_clock::now().time_since_epoch();
            if (end - begin > kLongest) moments_.push_back({begin, end});
        }
    }

    std::vector<Moment> moments_;  // the watcher's until `stop`
    std::jthread watcher_;
};

}  // namespace kelvo::test
