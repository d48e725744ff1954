#pragma once

#include "platform/RenderServer.h"
#include "platform/linux/x11/XConnection.h"

#include <memory>
#include <mutex>
#include <string>

namespace kelvo::x11 {

/// Tells from a window which process draws it, by what the X server itself knows of its clients; what
/// windows say about themselves is not believed. A window manager's frame belongs to the window within it.
/// One connection, made when it is first needed and again after it broke; a server that does not answer for
/// two seconds counts as one that cannot tell. Thread-safe: callers wait for each other.
class X11RenderServer : public RenderServer {
  public:
    explicit X11RenderServer(std::string display) : display_(std::move(display)) {}

    std::optional<std::int32_t> processIdentifierOfContext(std::uint32_t contextID) override;

  private:
    bool connect();
    bool windowExists(xcb_window_t window);
    xcb_window_t clientWithin(xcb_window_t frame);
    bool isWithin(xcb_window_t window, xcb_window_t ancestor);

    const std::string display_;
    std::mutex mutex_;
    std::unique_ptr<XConnection> connection_;
};

}  // namespace kelvo::x11
