#include "base/MainQueue.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <utility>

namespace kelvo {

void MainQueue::async(Task task) {
    std::lock_guard lock(mutex_);
    if (stopped_) return;
    tasks_.push_back(std::move(task));
    wakes_.notify_one();
}

void MainQueue::sync(const Task& task) {
    if (isCurrent()) {
        std::fprintf(stderr, "sync onto the main queue by a task that runs on it\n");
        std::abort();
    }
    // Shared, not on this stack: the loop may drop the task after this call has returned.
    const auto hasRun = std::make_shared<bool>(false);
    std::unique_lock lock(mutex_);
    if (stopped_) return;
    tasks_.push_back([this, &task, hasRun] {
        task();
        std::lock_guard done(mutex_);
        *hasRun = true;
        taskRan_.notify_all();
    });
    wakes_.notify_one();
    // A dropped task neither waits any more nor is the one that runs.
    taskRan_.wait(lock, [&] { return *hasRun || (stopped_ && tasks_.empty() && runningTasks_ == 0); });
}

std::shared_ptr<RepeatingTimer> MainQueue::scheduleRepeating(std::chrono::nanoseconds period, Task task) {
    auto timer = std::make_shared<RepeatingTimer>(period, clock_.monotonicNow() + period, std::move(task));
    std::lock_guard lock(mutex_);
    std::erase_if(timers_, [](const auto& entry) { return entry.expired(); });
    timers_.push_back(timer);
    wakes_.notify_one();
    return timer;
}

void MainQueue::run() {
    std::unique_lock lock(mutex_);
    loopThread_ = std::this_thread::get_id();
    while (!stopped_) {
        if (!runOneTask(lock) && !runDueTimers(lock)) waitForWork(lock);
    }
    loopThread_ = {};
    dropTasks(lock);
}

void MainQueue::stop() {
    std::unique_lock lock(mutex_);
    stopped_ = true;
    wakes_.notify_all();
    if (loopThread_ == std::thread::id()) dropTasks(lock);
}

void MainQueue::dropTasks(std::unique_lock<std::mutex>& lock) {
    const std::deque<Task> dropped = std::exchange(tasks_, {});
    taskRan_.notify_all();
    lock.unlock();  // what the tasks hold may call this queue as it goes
}

std::size_t MainQueue::runUntilIdle() {
    std::unique_lock lock(mutex_);
    const std::thread::id outer = std::exchange(loopThread_, std::this_thread::get_id());
    std::size_t count = 0;
    while (!stopped_ && (runOneTask(lock) || runDueTimers(lock)))
        ++count;
    loopThread_ = outer;
    if (stopped_ && outer == std::thread::id()) dropTasks(lock);
    return count;
}

bool MainQueue::isCurrent() const {
    std::lock_guard lock(mutex_);
    return loopThread_ == std::this_thread::get_id();
}

bool MainQueue::runOneTask(std::unique_lock<std::mutex>& lock) {
    if (tasks_.empty()) return false;
    Task task = std::move(tasks_.front());
    tasks_.pop_front();
    ++runningTasks_;
    lock.unlock();
    task();
    task = nullptr;
    lock.lock();
    --runningTasks_;
    return true;
}

bool MainQueue::runDueTimers(std::unique_lock<std::mutex>& lock) {
    std::shared_ptr<RepeatingTimer> timer = earliestTimer();
    const std::chrono::nanoseconds now = clock_.monotonicNow();
    if (!timer || timer->due_ > now) return false;
    const auto missed = (now - timer->due_) / timer->period_;
    timer->due_ += (missed + 1) * timer->period_;
    Task task = timer->task_;  // a copy: the task may invalidate its own timer
    lock.unlock();
    if (task) task();
    task = nullptr;  // what they hold may call this queue as it goes
    timer = nullptr;
    lock.lock();
    return true;
}

std::shared_ptr<RepeatingTimer> MainQueue::earliestTimer() {
    std::shared_ptr<RepeatingTimer> earliest;
    for (const auto& entry : timers_) {
        const auto timer = entry.lock();
        if (timer && timer->isValid() && (!earliest || timer->due_ < earliest->due_)) earliest = timer;
    }
    return earliest;
}

void MainQueue::waitForWork(std::unique_lock<std::mutex>& lock) {
    if (const auto timer = earliestTimer()) {
        wakes_.wait_for(lock, timer->due_ - clock_.monotonicNow());
    } else {
        wakes_.wait(lock);
    }
}

}  // namespace kelvo
