#pragma once

#include "base/VideoSurface.h"

#include <utility>

namespace kelvo {

/// Carries one surface to another process by handle, never by its pixels. Holds the surface for as long as it
/// lives. Caller's thread.
class KVIOSurfaceObject {
  public:
    const VideoSurfaceRef& ioSurface() const { return ioSurface_; }
    void setIOSurface(VideoSurfaceRef surface) { ioSurface_ = std::move(surface); }

  private:
    VideoSurfaceRef ioSurface_;
};

}  // namespace kelvo
