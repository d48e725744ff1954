#pragma once

#include "base/SerialQueue.h"

#include <memory>

namespace kelvo {

/// Says that the calling thread has time when the scope ends: one task that it is given until then runs
/// there, and no other thread has to be woken for it. Waking one costs more than most tasks.
class SpareTime {
  public:
    /// Runs a task in a turn that was taken for it.
    class TurnHolder {
      public:
        virtual ~TurnHolder() = default;
        virtual void runInTurn(const Task& task) = 0;
    };

    SpareTime();
    /// Runs what was given; a task that is given more then has no spare time.
    ~SpareTime();
    SpareTime(const SpareTime&) = delete;
    SpareTime& operator=(const SpareTime&) = delete;

    /// Whether the calling thread is within such a scope, and its time is not spent yet.
    static bool isThere();
    /// Only when it `isThere`.
    static void spend(std::shared_ptr<TurnHolder> queue, Task task);

  private:
    SpareTime* const outer_;
    std::shared_ptr<TurnHolder> queue_;
    Task task_;
};

}  // namespace kelvo
