#pragma once

#include <functional>
#include <memory>
#include <string>

namespace kelvo {

/// A piece of work for a queue.
using Task = std::function<void()>;

/// Runs its tasks one after another, in the order in which they were given. Thread-safe.
///
/// `async` tasks run on the queue's own thread, which starts with the first of them and carries the label as
/// its name (its last 15 bytes, which is what the kernel keeps). A `sync` task runs on the caller's thread
/// once it is its turn, so an uncontended `sync` costs no thread switch.
class SerialQueue {
  public:
    explicit SerialQueue(std::string label);

    /// Runs what is still queued, then ends the queue's thread. The last reference may go on the queue
    /// itself, and on a thread that is to run a task of `asyncOrSoon` yet: then the rest runs later.
    ~SerialQueue();
    SerialQueue(const SerialQueue&) = delete;
    SerialQueue& operator=(const SerialQueue&) = delete;

    const std::string& label() const;

    /// Queues `task` and returns.
    void async(Task task);

    /// As `async`; but when nothing runs and nothing waits, and the calling thread has time to spare after
    /// what it does now, that thread runs the task then and there.
    void asyncOrSoon(Task task);

    /// Runs `task` in its turn and returns when it has run. A `sync` onto a queue on which the caller already
    /// runs, be it through other queues' `sync`, would wait for itself: it is a bug and aborts with the
    /// queue's label.
    void sync(const Task& task);

    /// Takes the turn for a task of the caller's if nothing runs and nothing waits, and never waits itself.
    /// True obliges the caller to `runInTurn`, once, from any thread; tasks that come meanwhile run after
    /// that, the first few of them on the same thread.
    bool tryTakeTurn();
    void runInTurn(const Task& task);

    /// Whether the calling thread runs a task of this queue now.
    bool isCurrent() const;

    /// Little or nothing will be queued from now on: the queue's thread ends whenever there is nothing to do,
    /// and a later `async` task starts another.
    void retire();

  private:
    class State;
    std::shared_ptr<State> state_;
};

}  // namespace kelvo
