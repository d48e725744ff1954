#include "base/SerialQueue.h"

#include "base/SpareTime.h"
#include "base/ThreadName.h"

#include <algorithm>
#include <condition_variable>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <deque>
#include <mutex>
#include <thread>
#include <utility>
#include <vector>

namespace kelvo {
namespace {

/// Tasks that whoever took a turn runs behind its own, before the queue's thread is woken for the rest.
constexpr std::size_t kMostBehindATurn = 4;

/// A `sync` caller that waits for its turn.
struct Turn {
    std::condition_variable granted;
    bool isGranted = false;
};

/// What waits in the queue: a task for the queue's thread, or somebody's turn.
struct Item {
    Task task;
    Turn* turn = nullptr;
};

/// The queues on which the calling thread runs, outermost first.
std::vector<const void*>& queuesOfThread() {
    thread_local std::vector<const void*> queues;
    return queues;
}

/// Marks the calling thread as running on a queue.
class Running {
  public:
    explicit Running(const void* queue) { queuesOfThread().push_back(queue); }
    ~Running() { queuesOfThread().pop_back(); }
    Running(const Running&) = delete;
    Running& operator=(const Running&) = delete;
};

}  // namespace

/// One token says who may run: nobody (`busy_` is false), the queue's thread, or one `sync` caller. Whoever
/// holds it passes it on to the oldest item when its own work is done.
class SerialQueue::State : public SpareTime::TurnHolder {
  public:
    explicit State(std::string label) : label_(std::move(label)) {}

    const std::string& label() const { return label_; }

    bool isCurrent() const {
        const auto& queues = queuesOfThread();
        return std::find(queues.begin(), queues.end(), this) != queues.end();
    }

    void async(Task task, const std::shared_ptr<State>& self) {
        std::lock_guard lock(mutex_);
        items_.push_back({std::move(task), nullptr});
        if (!worker_.joinable()) worker_ = std::thread([self] { self->work(); });
        if (!busy_) passToken();
    }

    void sync(const Task& task) {
        if (isCurrent()) abortWithLabel();
        acquireToken();
        {
            const Running running(this);
            task();
        }
        const std::lock_guard lock(mutex_);
        passToken();
    }

    /// `runsOn`: the thread that will run in the turn, if that is certain.
    bool tryTakeTurn(std::thread::id runsOn = {}) {
        const std::lock_guard lock(mutex_);
        if (std::exchange(busy_, true)) return false;
        turnRunsOn_ = runsOn;
        return true;
    }
    void runInTurn(const Task& task) override {
        const Running running(this);
        task();
        std::unique_lock lock(mutex_);
        // What came meanwhile needs no other thread to be woken for it, as long as it is little.
        runOwnItems(lock, kMostBehindATurn);
        turnRunsOn_ = {};
        passToken();
    }

    void retire() {
        std::lock_guard lock(mutex_);
        retired_ = true;
        workerWakes_.notify_one();
    }

    void finish() {
        std::thread worker;
        bool isTurnOurs = false;
        {
            std::lock_guard lock(mutex_);
            finishing_ = true;
            isTurnOurs = turnRunsOn_ == std::this_thread::get_id();
            worker = std::move(worker_);
            workerWakes_.notify_one();
        }
        if (!worker.joinable()) return;
        if (isTurnOurs || isCurrent()) {
            // The last reference went in one of our own tasks, or before one that this thread is about to
            // run: the queue's thread would wait for it. The state lives on with the thread.
            worker.detach();
        } else {
            worker.join();
        }
    }

  private:
    [[noreturn]] void abortWithLabel() const {
        std::fprintf(stderr, "sync onto the queue \"%s\" by a task that runs on it\n", label_.c_str());
        std::abort();
    }

    void acquireToken() {
        std::unique_lock lock(mutex_);
        if (!busy_) {
            busy_ = true;
            return;
        }
        Turn turn;
        items_.push_back({nullptr, &turn});
        turn.granted.wait(lock, [&turn] { return turn.isGranted; });
    }

    /// Under the lock, by the holder of the token (or by anyone while nobody holds it).
    void passToken() {
        busy_ = !items_.empty();
        if (!busy_) {
            if (isLeaving()) workerWakes_.notify_one();  // a `sync` task let the queue go: nothing follows it
            return;
        }
        if (Turn* turn = items_.front().turn; turn != nullptr) {
            items_.pop_front();
            turn->isGranted = true;
            turn->granted.notify_one();
        } else {
            workerHasToken_ = true;
            workerWakes_.notify_one();
        }
    }

    void work() {
        nameCurrentThread(label_);
        const Running running(this);
        std::unique_lock lock(mutex_);
        while (true) {
            workerWakes_.wait(lock, [this] { return workerHasToken_ || (isLeaving() && !busy_); });
            if (!workerHasToken_) {
                if (worker_.joinable()) worker_.detach();  // nobody waits for it; the state lives on with it
                return;
            }
            workerHasToken_ = false;
            runOwnItems(lock, SIZE_MAX);
            passToken();
        }
    }

    /// Whether the queue's thread is to end when there is nothing to do.
    bool isLeaving() const { return finishing_ || retired_; }

    void runOwnItems(std::unique_lock<std::mutex>& lock, std::size_t most) {
        for (std::size_t i = 0; i < most && !items_.empty() && items_.front().turn == nullptr; ++i) {
            Task task = std::move(items_.front().task);
            items_.pop_front();
            lock.unlock();
            task();
            task = nullptr;  // what the task holds goes before the next one runs, and outside the lock
            lock.lock();
        }
    }

    const std::string label_;
    std::mutex mutex_;
    std::condition_variable workerWakes_;
    std::deque<Item> items_;
    std::thread worker_;
    bool busy_ = false;
    std::thread::id turnRunsOn_;
    bool workerHasToken_ = false;
    bool finishing_ = false;
    bool retired_ = false;
};

SerialQueue::SerialQueue(std::string label) : state_(std::make_shared<State>(std::move(label))) {}
SerialQueue::~SerialQueue() {
    state_->finish();
}

const std::string& SerialQueue::label() const {
    return state_->label();
}
bool SerialQueue::isCurrent() const {
    return state_->isCurrent();
}
void SerialQueue::retire() {
    state_->retire();
}
void SerialQueue::async(Task task) {
    state_->async(std::move(task), state_);
}
void SerialQueue::asyncOrSoon(Task task) {
    if (!SpareTime::isThere() || !state_->tryTakeTurn(std::this_thread::get_id()))
        return async(std::move(task));
    SpareTime::spend(state_, std::move(task));
}
void SerialQueue::sync(const Task& task) {
    const std::shared_ptr<State> state = state_;  // the task may let the last reference to this queue go
    state->sync(task);
}
bool SerialQueue::tryTakeTurn() {
    return state_->tryTakeTurn();
}
void SerialQueue::runInTurn(const Task& task) {
    const std::shared_ptr<State> state = state_;
    state->runInTurn(task);
}

}  // namespace kelvo
