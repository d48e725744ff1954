#pragma once

#include "base/Guarded.h"
#include "base/SerialQueue.h"

#include <cstddef>
#include <utility>
#include <vector>

namespace kelvo {

/// The removals of thrown-away movies that still run. A new movie may bear the name of such a one, so that it
/// must not be begun before they are over. Thread-safe.
class RunningCleanUps {
  public:
    void begin() {
        state_.with([](State& state) { ++state.running; });
    }

    /// Ends one that was begun; the last one runs what waits.
    void end() {
        const std::vector<Task> due = state_.with([](State& state) {
            return --state.running == 0 ? std::exchange(state.waiting, {}) : std::vector<Task>();
        });
        for (const Task& task : due)
            task();
    }

    /// Runs `task` once no clean-up runs: at once, or on the thread that ends the last one.
    void afterwards(const Task& task) {
        const bool mustWait = state_.with([&](State& state) {
            if (state.running > 0) state.waiting.push_back(task);
            return state.running > 0;
        });
        if (!mustWait) task();
    }

  private:
    struct State {
        std::size_t running = 0;
        std::vector<Task> waiting;
    };

    Guarded<State> state_;
};

}  // namespace kelvo
