#include "base/GlobalQueue.h"

#include "base/ThreadName.h"

#include <array>
#include <chrono>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <thread>

namespace kelvo {
namespace {

constexpr std::size_t kMostThreads = 16;
constexpr std::chrono::seconds kIdleTime{5};
constexpr std::array<const char*, 4> kThreadNames{"kelvo.high", "kelvo.normal", "kelvo.low",
                                                  "kelvo.backgrnd"};

/// The threads that all global queues share.
class Pool {
  public:
    static Pool& shared() {
        static Pool pool;
        return pool;
    }

    void add(QueuePriority priority, Task task) {
        std::lock_guard lock(mutex_);
        waiting_[static_cast<std::size_t>(priority)].push_back(std::move(task));
        ++waitingCount_;
        if (waitingCount_ > idle_ && threads_ < kMostThreads) {
            ++threads_;
            // Detached: idle threads end by themselves, and the destructor waits for the count instead.
            std::thread([this] { work(); }).detach();
        } else {
            wakes_.notify_one();
        }
    }

    void drain() {
        std::unique_lock lock(mutex_);
        quiet_.wait(lock, [this] { return waitingCount_ == 0 && running_ == 0; });
    }

  private:
    ~Pool() {
        std::unique_lock lock(mutex_);
        ending_ = true;
        wakes_.notify_all();
        quiet_.wait(lock, [this] { return threads_ == 0; });
    }

    void work() {
        std::unique_lock lock(mutex_);
        while (awaitTask(lock))
            runNext(lock);
        --threads_;
        quiet_.notify_all();
    }

    bool awaitTask(std::unique_lock<std::mutex>& lock) {
        ++idle_;
        wakes_.wait_for(lock, kIdleTime, [this] { return waitingCount_ > 0 || ending_; });
        --idle_;
        return waitingCount_ > 0 && !ending_;
    }

    void runNext(std::unique_lock<std::mutex>& lock) {
        std::size_t priority = 0;
        while (waiting_[priority].empty())
            ++priority;
        Task task = std::move(waiting_[priority].front());
        waiting_[priority].pop_front();
        --waitingCount_;
        ++running_;
        lock.unlock();
        nameCurrentThread(kThreadNames[priority]);
        task();
        task = nullptr;
        lock.lock();
        if (--running_ == 0 && waitingCount_ == 0) quiet_.notify_all();
    }

    std::mutex mutex_;
    std::condition_variable wakes_;
    std::condition_variable quiet_;
    std::array<std::deque<Task>, 4> waiting_;
    std::size_t waitingCount_ = 0;
    std::size_t running_ = 0;
    std::size_t idle_ = 0;
    std::size_t threads_ = 0;
    bool ending_ = false;
};

}  // namespace

void GlobalQueue::async(Task task) const {
    Pool::shared().add(priority_, std::move(task));
}

void GlobalQueue::drain() {
    Pool::shared().drain();
}

}  // namespace kelvo
