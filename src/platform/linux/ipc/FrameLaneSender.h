#pragma once

#include "platform/linux/ipc/FrameLane.h"
#include "platform/linux/ipc/SurfaceLending.h"

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace kelvo {

/// The daemon's end of a frame lane: what is lent over it, and which surfaces the client has. Under the
/// owner's lock.
class FrameLaneSender {
  public:
    using Moment = std::chrono::steady_clock::time_point;

    /// How long after its last frame a surface counts as one that the client has: half of what the client
    /// keeps it for.
    static constexpr std::chrono::nanoseconds kPatience =
        std::chrono::nanoseconds(SurfaceCache::kPatience) / 2;

    explicit FrameLaneSender(FrameLane lane) : lane_(std::move(lane)) {}

    /// The surface went to the client in a message, or goes now.
    void sentInMessage(const VideoSurface& surface, Moment now);
    /// Puts a frame that can go by the lane: the client has the surface, and there is a place. False when
    /// not.
    bool put(std::uint32_t serial, const IPCFrame& frame, Moment now);
    /// To ring when the lock is free: that wakes a thread.
    const FrameLane& lane() const { return lane_; }

    /// Moves what the client has given back to `gone`, for the owner to let go of after its lock is free.
    void takeGivenBack(LentSurfaces& gone);
    /// The same for the frame with this serial, which the client gave back by a message.
    void takeGivenBack(std::uint32_t serial, LentSurfaces& gone);
    /// The client did not have a surface: all of them go in messages first.
    void forgetSurfaces() { known_.clear(); }

    std::size_t lentCount() const { return lentCount_; }

  private:
    struct Loan {
        std::uint32_t serial = 0;
        VideoSurfaceRef surface;
    };
    struct Known {
        VideoSurface::File file;
        VideoSurface::Geometry geometry;
        Moment lastSent;
    };
    void takeBack(std::size_t place, LentSurfaces& gone);

    FrameLane lane_;
    std::uint32_t count_ = 0;
    std::array<Loan, FrameLane::kPlaces> loans_;
    std::size_t lentCount_ = 0;
    std::vector<Known> known_;
};

}  // namespace kelvo
