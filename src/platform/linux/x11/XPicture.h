#pragma once

#include "base/VideoSurface.h"

#include <xcb/shm.h>
#include <xcb/xcb.h>

namespace kelvo::x11 {

/// A surface into which the X server writes.
struct ShmTarget {
    VideoSurface& surface;
    xcb_shm_seg_t segment;
};

/// What a screen source looks at: it knows when that changes and lets the server write it into a surface.
/// Belongs to its connection's thread. What it makes on the server goes with the connection.
class XPicture {
  public:
    virtual ~XPicture() = default;

    /// Begins to watch. False when the display lacks what that needs.
    virtual bool watch() = 0;

    /// Takes an event in and says whether the picture changed.
    virtual bool handle(const xcb_generic_event_t& event) = 0;

    /// Asks to be told of the next drawing: one change is told, later ones only after the next call. Returns
    /// the request's sequence number. Drawing told with an earlier number happened before.
    virtual unsigned rearm() = 0;

    /// Looks again at whatever moved or changed its size; the geometry of frames from now on.
    virtual VideoSurface::Geometry refresh() = 0;

    /// Writes the picture as it is now. False when that failed, because it is changing its shape just now or
    /// because the connection is gone.
    virtual bool grab(const ShmTarget& target) = 0;
};

}  // namespace kelvo::x11
