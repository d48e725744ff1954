#pragma once

#include "base/Clock.h"
#include "base/SerialQueue.h"

#include <chrono>
#include <condition_variable>
#include <deque>
#include <memory>
#include <mutex>
#include <thread>
#include <vector>

namespace kelvo {

/// A timer of the main queue. Goes on until it is invalidated or the last reference to it is dropped.
class RepeatingTimer {
  public:
    RepeatingTimer(std::chrono::nanoseconds period, std::chrono::nanoseconds firstDue, Task task)
        : period_(period), due_(firstDue), task_(std::move(task)) {}

    /// The task does not run again. On the main queue; a run that has begun is finished.
    void invalidate() { task_ = nullptr; }
    bool isValid() const { return task_ != nullptr; }

  private:
    friend class MainQueue;
    const std::chrono::nanoseconds period_;
    std::chrono::nanoseconds due_;
    Task task_;
};

/// The run loop of the process's main thread: tasks in order, and repeating timers that follow its clock.
/// Giving tasks and stopping are thread-safe; timers belong to the main thread.
///
/// With the system's clock, `run` waits for work and for timers. With a clock that a test moves, the test
/// calls `runUntilIdle` instead and nothing ever waits.
class MainQueue {
  public:
    explicit MainQueue(const Clock& clock) : clock_(clock) {}

    /// Queues `task`. Dropped once the loop has ended.
    void async(Task task);

    /// Runs `task` on the main thread and returns when it has run. From the main thread's own loop it is a
    /// bug and aborts. Returns without running `task` once the loop has ended.
    void sync(const Task& task);

    /// Runs `task` every `period` from now on, for as long as the timer is held. A late timer skips the runs
    /// it missed.
    std::shared_ptr<RepeatingTimer> scheduleRepeating(std::chrono::nanoseconds period, Task task);

    /// Runs tasks and timers on the calling thread until `stop`.
    void run();

    /// Ends `run` after the task that runs now. Thread-safe; waiting `sync` callers return.
    void stop();

    /// Runs what is queued and what is due, until neither is left; returns how many tasks and timers ran.
    std::size_t runUntilIdle();

    bool isCurrent() const;

  private:
    bool runOneTask(std::unique_lock<std::mutex>& lock);
    bool runDueTimers(std::unique_lock<std::mutex>& lock);
    std::shared_ptr<RepeatingTimer> earliestTimer();
    void waitForWork(std::unique_lock<std::mutex>& lock);
    /// Gives `lock` up.
    void dropTasks(std::unique_lock<std::mutex>& lock);

    const Clock& clock_;
    mutable std::mutex mutex_;
    std::condition_variable wakes_;
    std::condition_variable taskRan_;
    std::deque<Task> tasks_;
    std::vector<std::weak_ptr<RepeatingTimer>> timers_;
    std::size_t runningTasks_ = 0;  // more than one when a task runs the loop itself
    std::thread::id loopThread_;
    bool stopped_ = false;
};

}  // namespace kelvo
