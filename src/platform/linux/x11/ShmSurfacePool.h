#pragma once

#include "base/VideoSurfacePool.h"
#include "platform/linux/x11/XConnection.h"

#include <cstddef>
#include <map>
#include <xcb/shm.h>

namespace kelvo::x11 {

/// A pool of surfaces into which the X server writes and which nobody else can change. Belongs to its
/// connection's thread, and goes before the connection does.
class ShmSurfacePool {
  public:
    ShmSurfacePool(XConnection& connection, const VideoSurface::Geometry& geometry, std::size_t capacity);
    ~ShmSurfacePool();
    ShmSurfacePool(const ShmSurfacePool&) = delete;
    ShmSurfacePool& operator=(const ShmSurfacePool&) = delete;

    /// None when all surfaces are in use.
    Result<VideoSurfaceRef> take() { return pool_.take(); }
    const VideoSurface::Geometry& geometry() const { return pool_.geometry(); }

    xcb_shm_seg_t segmentOf(const VideoSurface& surface) const { return segments_.at(&surface); }

  private:
    OptionalError attach(VideoSurface& surface);

    XConnection& connection_;
    std::map<const VideoSurface*, xcb_shm_seg_t> segments_;
    VideoSurfacePool pool_;
};

}  // namespace kelvo::x11
