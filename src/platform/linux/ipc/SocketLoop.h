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

namespace kelvo {

/// Something that waits for a descriptor.
class SocketWatcher {
  public:
    using Moment = std::chrono::steady_clock::time_point;

    virtual ~SocketWatcher() = default;
    /// The descriptor is ready. Nothing more is reported until it is armed again. On the loop's thread.
    virtual void ready(std::uint32_t events) = 0;
    /// Called when a moment has come that was asked for; returns the next one. On the loop's thread.
    virtual std::optional<Moment> tick(Moment now) = 0;
};

/// The one thread that does the socket work of all connections. It starts with the first watcher, runs no
/// request, and sleeps while nothing happens. Thread-safe.
class SocketLoop {
  public:
    using Token = std::uint64_t;
    /// The time, which never goes backwards.
    using Clock = std::function<SocketWatcher::Moment()>;

    explicit SocketLoop(Clock clock = SocketWatcher::Moment::clock::now);
    ~SocketLoop();
    SocketLoop(const SocketLoop&) = delete;
    SocketLoop& operator=(const SocketLoop&) = delete;

    /// Ends the thread and lets every watcher go. Not from a watcher.
    void stop();

    /// Watches a descriptor, and holds the watcher until `remove`. Not armed yet.
    Token add(int descriptor, std::shared_ptr<SocketWatcher> watcher);
    /// Reports these events (of epoll) once.
    void arm(int descriptor, Token token, std::uint32_t events);
    /// Before the descriptor is closed.
    void remove(int descriptor, Token token);
    SocketWatcher::Moment now() const;
    /// Ticks every watcher at `moment` or soon after. On the loop's thread.
    void tickAt(SocketWatcher::Moment moment);

  private:
    struct Shared;
    static void run(const std::shared_ptr<Shared>& shared);

    const std::shared_ptr<Shared> shared_;
    std::mutex startMutex_;
    std::thread thread_;
};

}  // namespace kelvo
