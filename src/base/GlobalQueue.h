#pragma once

#include "base/SerialQueue.h"

#include <cstddef>

namespace kelvo {

/// How soon background work is due.
enum class QueuePriority { high, normal, low, background };

/// The process's queues for background work, one a priority. Tasks of one queue start in order but run side
/// by side; a task of a higher priority starts before any waiting one of a lower priority. Thread-safe.
///
/// Threads are started as tasks need them, at most 16, and end after five idle seconds. A task may block.
class GlobalQueue {
  public:
    static GlobalQueue get(QueuePriority priority) { return GlobalQueue(priority); }

    void async(Task task) const;

    /// Waits until no task of any priority waits or runs. For tests and for an orderly exit; never from a
    /// task.
    static void drain();

  private:
    explicit GlobalQueue(QueuePriority priority) : priority_(priority) {}

    QueuePriority priority_;
};

}  // namespace kelvo
