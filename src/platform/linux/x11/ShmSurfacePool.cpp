#include "platform/linux/x11/ShmSurfacePool.h"

#include <cerrno>
#include <fcntl.h>

namespace kelvo::x11 {

ShmSurfacePool::ShmSurfacePool(XConnection& connection, const VideoSurface::Geometry& geometry,
                               std::size_t capacity)
    : connection_(connection),
      pool_(geometry, capacity, [this](VideoSurface& surface) { return attach(surface); }) {}

ShmSurfacePool::~ShmSurfacePool() {
    for (const auto& [surface, segment] : segments_)
        xcb_shm_detach(connection_.raw(), segment);
}

/// Order matters: the server maps the file for writing when it attaches, and once the file is sealed no new
/// mapping can write.
OptionalError ShmSurfacePool::attach(VideoSurface& surface) {
    xcb_connection_t* const c = connection_.raw();
    const int descriptor = ::fcntl(surface.descriptor(), F_DUPFD_CLOEXEC, 0);
    if (descriptor < 0) return KVError::posix(errno, "surface descriptor");
    const xcb_shm_seg_t segment = xcb_generate_id(c);
    const auto attached = xcb_shm_attach_fd_checked(c, segment, descriptor, 0);  // closes the descriptor
    // Any reply says that the server has come past the request, so that asking for its error cannot block.
    if (!connection_.await<xcb_get_input_focus_reply_t>(xcb_get_input_focus(c)))
        return KVError::posix(ECONNRESET, "display");
    const XOwned<xcb_generic_error_t> refused(xcb_request_check(c, attached));
    if (refused) return KVError::posix(EACCES, "shared memory of the display");
    segments_.emplace(&surface, segment);
    return surface.seal();
}

}  // namespace kelvo::x11
