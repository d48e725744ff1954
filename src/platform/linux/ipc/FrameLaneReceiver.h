#pragma once

#include "platform/linux/ipc/FrameLane.h"
#include "platform/linux/ipc/SocketLoop.h"

#include <atomic>
#include <functional>
#include <optional>

namespace kelvo {

/// The client's end of a frame lane.
class FrameLaneReceiver : public SocketBell {
  public:
    /// `rung` runs on the bell's thread when there may be something.
    FrameLaneReceiver(FrameLane lane, std::function<void()> rung)
        : lane_(std::move(lane)), rung_(std::move(rung)) {}

    /// Whether a frame waits. Any thread.
    bool hasFront() const { return lane_.hasEntry(taken_); }
    /// The one that waits longest. Under the owner's lock.
    FrameLane::Entry front() const { return lane_.entry(taken_); }
    /// Takes it away; says where to give it back. Under the owner's lock.
    std::size_t takeFront() { return taken_++ % FrameLane::kPlaces; }

    /// The daemon finds it there when it sends the next frame. Any thread.
    void giveBack(std::size_t place, std::uint32_t serial) { lane_.giveBack(place, serial); }

    bool wait() override;
    void ready() override { rung_(); }
    void stop() override;

  private:
    FrameLane lane_;
    const std::function<void()> rung_;
    std::atomic<std::uint32_t> taken_{0};
    std::optional<std::uint32_t> heard_;  // the bell's thread's
    std::atomic<bool> isStopped_{false};
};

}  // namespace kelvo
