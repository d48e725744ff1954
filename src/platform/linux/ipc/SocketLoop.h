#pragma once

#include "base/UniqueFd.h"

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <thread>
#include <vector>

namespace kelvo {

/// Something that waits for a descriptor.
class SocketWatcher {
  public:
    using Moment = std::chrono::steady_clock::time_point;

    virtual ~SocketWatcher() = default;
    /// The descriptor is ready. Nothing more is reported until it is armed again. On a thread of the loop.
    virtual void ready(std::uint32_t events) = 0;
    /// Called when a moment has come that was asked for; returns the next one. On a thread of the loop.
    virtual std::optional<Moment> tick(Moment now) = 0;
};

/// Something that is waited for on a thread of its own, because it is no descriptor.
class SocketBell {
  public:
    virtual ~SocketBell() = default;
    /// Returns true when there may be something to do, and false once it was stopped. On its thread.
    virtual bool wait() = 0;
    /// Does it. On its thread.
    virtual void ready() = 0;
    /// Never waits. Any thread.
    virtual void stop() = 0;
};

/// The socket work of all connections. It starts with the first watcher and sleeps while nothing happens.
///
/// Two threads wait for sockets. Either may go on to run what a message asks for, because waking one more
/// thread would cost as much as the whole way of the message; but not while the other one does so: however
/// long that takes, a thread is left for the sockets. The second one starts when it is first missed.
/// Thread-safe.
class SocketLoop {
  public:
    using Token = std::uint64_t;
    /// The time, which never goes backwards.
    using Clock = std::function<SocketWatcher::Moment()>;

    explicit SocketLoop(Clock clock = SocketWatcher::Moment::clock::now);
    ~SocketLoop();
    SocketLoop(const SocketLoop&) = delete;
    SocketLoop& operator=(const SocketLoop&) = delete;

    /// Ends the threads and lets every watcher go. Not from a watcher.
    void stop();

    /// Watches a descriptor, and holds the watcher until `remove`. Not armed yet.
    Token add(int descriptor, std::shared_ptr<SocketWatcher> watcher);
    /// Reports these events (of epoll) once.
    void arm(int descriptor, Token token, std::uint32_t events);
    /// Before the descriptor is closed.
    void remove(int descriptor, Token token);
    SocketWatcher::Moment now() const;
    /// Ticks every watcher at `moment` or soon after.
    void tickAt(SocketWatcher::Moment moment);

    /// Waits for a bell, until that is stopped or the loop is.
    void attend(const std::shared_ptr<SocketBell>& bell);

    /// From `ready` of a watcher: whether the thread may run a task once it is done with all that was ready;
    /// never on any other thread. True obliges the caller to `runAfterwards`, with nothing if it
    /// has no task after all.
    bool mayRunAfterwards();
    void runAfterwards(std::function<void()> task);

  private:
    struct Shared;
    static void run(const std::shared_ptr<Shared>& shared);
    static void attendTo(SocketBell& bell);
    static void end(std::thread& thread);
    void startThread(std::size_t count);
    void stopThreads();

    const std::shared_ptr<Shared> shared_;
    std::mutex startMutex_;
    std::vector<std::thread> threads_;
};

}  // namespace kelvo
