#pragma once

#include "base/SerialQueue.h"

#include <vector>

namespace kelvo {

/// Says that the calling thread has time when the scope ends: what it is given until then runs there, and no
/// other thread has to be woken for it. Waking one costs more than most tasks.
class SpareTime {
  public:
    SpareTime();
    /// Runs what was given, in its order; a task that is given more then has none.
    ~SpareTime();
    SpareTime(const SpareTime&) = delete;
    SpareTime& operator=(const SpareTime&) = delete;

    /// Whether the calling thread is within such a scope.
    static bool isThere();
    /// Only when it `isThere`.
    static void spend(Task task);

  private:
    SpareTime* const outer_;
    std::vector<Task> tasks_;
};

}  // namespace kelvo
