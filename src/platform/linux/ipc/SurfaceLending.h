#pragma once

#include "base/Result.h"
#include "base/UniqueFd.h"
#include "base/VideoSurface.h"
#include "platform/IPCInterface.h"

#include <chrono>
#include <cstddef>
#include <memory>
#include <sys/types.h>
#include <vector>

/// Surfaces are lent: the sender of a message keeps a surface out of its pool until the receiver has let go
/// of it, which the receiver says by answering the message. What both sides need for that.
namespace kelvo {

using LentSurfaces = std::vector<std::shared_ptr<ObjectHandle>>;

/// The surfaces among a message's arguments.
LentSurfaces surfacesIn(const std::vector<IPCArgument>& description, const Array& arguments);

/// Makes each surface among the arguments hold `lease` as well: it goes with the last reference to the last
/// of them.
void tieSurfacesTo(const std::shared_ptr<void>& lease, const std::vector<IPCArgument>& description,
                   Array& arguments);

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

    void dropUnused(Moment now);
    bool empty() const { return entries_.empty(); }

  private:
    /// The memory file's identity; its number is nobody else's for as long as the surface holds the file.
    struct Entry {
        dev_t device;
        ino_t file;
        VideoSurfaceRef surface;
        Moment lastUse;
    };
    std::vector<Entry> entries_;
};

}  // namespace kelvo
