#pragma once

#include "base/Result.h"
#include "base/UniqueFd.h"
#include "base/VideoSurface.h"
#include "platform/IPCInterface.h"

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

/// Surfaces are lent: the sender of a message keeps a surface out of its pool until the receiver has let go
/// of it, which the receiver says by answering the message. What both sides need for that.
namespace kelvo {

using LentSurfaces = std::vector<std::shared_ptr<ObjectHandle>>;

/// The surfaces among a message's arguments.
LentSurfaces surfacesIn(const std::vector<IPCArgument>& description, const Array& arguments);

/// The same surface, which holds `lease` as well: that goes with the last reference to the last of a
/// message's surfaces.
VideoSurfaceRef tiedTo(const std::shared_ptr<void>& lease, const VideoSurfaceRef& surface);

/// The messages of a peer whose surfaces this side has let go of without having said so. Whoever sends one
/// frame after the other needs none of them back at once, so it is told of a few together and woken once for
/// them; but without delay while this side holds more than one, as then its pool may run dry. Under the
/// owner's lock.
class SurfaceReturns {
  public:
    using Moment = std::chrono::steady_clock::time_point;

    /// A pool of eight has one for the frame that is looked at then, and one for the next.
    static constexpr std::size_t kMostTogether = 6;
    /// How long one waits for the others.
    static constexpr std::chrono::milliseconds kPatience{250};

    /// Whether the surface that is let go of is the only one, and nothing waits.
    bool isQuiet() const { return held_ == 1 && waiting_.empty(); }
    /// That one is let go of, and the peer finds out by itself.
    void letGoQuietly() { --held_; }

    /// A message with surfaces came. True when the peer is to be told now.
    bool hold() { return held_++ > 0 && !waiting_.empty(); }
    /// The surfaces of the message with this serial are let go of. True when the peer is to be told now.
    bool letGo(std::uint32_t serial, Moment now);
    /// The serials of which the peer is to be told. None waits any more.
    std::vector<std::uint32_t> take();
    /// When the peer is to be told of those that wait.
    std::optional<Moment> due() const { return due_; }

  private:
    std::size_t held_ = 0;
    std::vector<std::uint32_t> waiting_;
    std::optional<Moment> due_;
};

/// The surfaces that a peer sent lately, so that each of its pool's is mapped and checked once and not for
/// every frame. One thread's.
class SurfaceCache {
  public:
    using Moment = std::chrono::steady_clock::time_point;

    /// As many as any pool has, and some of the pool before it.
    static constexpr std::size_t kMostSurfaces = 16;
    /// How long a surface is kept that comes no more: its pixels belong to a pool that is gone.
    static constexpr std::chrono::seconds kPatience{1};

    /// As `VideoSurface::fromDescriptor`.
    Result<VideoSurfaceRef> open(UniqueFd descriptor, const VideoSurface::Geometry& geometry, Moment now);

    /// The surface of a file that was opened; none when it is not kept any more.
    VideoSurfaceRef find(const VideoSurface::File& file, Moment now);

    void dropUnused(Moment now);
    bool empty() const { return entries_.empty(); }

  private:
    struct Entry {
        VideoSurfaceRef surface;
        Moment lastUse;
    };
    std::vector<Entry> entries_;
};

}  // namespace kelvo
