#pragma once

#include "base/Guarded.h"
#include "base/VideoSurface.h"

#include <cstddef>
#include <functional>
#include <memory>
#include <vector>

namespace kelvo {

/// A bounded set of equal surfaces. `take` lends one; it comes back when its last reference goes, on any
/// thread and also after the pool itself is gone. Surfaces are made when they are first needed. Taking
/// belongs to one thread.
class VideoSurfacePool {
  public:
    /// Readies a new surface before it is lent for the first time. What it reports makes `take` fail.
    using Prepare = std::function<OptionalError(VideoSurface&)>;

    VideoSurfacePool(const VideoSurface::Geometry& geometry, std::size_t capacity, Prepare prepare = {});

    /// A surface that nobody else holds, with whatever its last user left in it. None when all `capacity`
    /// surfaces are in use.
    Result<VideoSurfaceRef> take();

    const VideoSurface::Geometry& geometry() const { return geometry_; }
    /// How many surfaces exist, lent or not.
    std::size_t size() const { return made_; }

  private:
    using Free = Guarded<std::vector<VideoSurfaceRef>>;

    VideoSurfaceRef lend(VideoSurfaceRef surface) const;

    const VideoSurface::Geometry geometry_;
    const std::size_t capacity_;
    const Prepare prepare_;
    std::size_t made_ = 0;
    const std::shared_ptr<Free> free_ = std::make_shared<Free>();
};

}  // namespace kelvo
