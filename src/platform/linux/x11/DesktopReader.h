#pragma once

#include "platform/linux/x11/DesktopView.h"
#include "platform/linux/x11/XConnection.h"

#include <map>
#include <optional>
#include <string_view>
#include <vector>

namespace kelvo::x11 {

/// Reads what an X desktop shows, from what its window manager tells (EWMH). Without a window manager every
/// top-level window that is mapped, but for menus and the like (override-redirect), is an application's, and
/// the window that has the keyboard is the active one, else the topmost. One thread.
class DesktopReader {
  public:
    /// None when the server cannot tell whose a window is.
    static std::optional<DesktopReader> open(XConnection& connection);

    /// None when the server stopped answering.
    std::optional<DesktopView> read();

    /// Asks the server for an event at whatever may change the view, of the root and of the windows that the
    /// last `read` saw. Says whether there was anything to ask for that had not been asked for before.
    bool selectEvents();

    /// Another window may have this number from now on.
    void forget(xcb_window_t window);

  private:
    struct Asked;
    struct Context;

    explicit DesktopReader(XConnection& connection) : connection_(&connection) {}
    std::vector<xcb_window_t> topLevelWindows();
    xcb_window_t activeWindow();
    xcb_window_t focusedTopLevel();
    DesktopArea area(std::uint32_t desktop);
    std::uint32_t currentDesktop();
    Asked ask(xcb_window_t window);
    void take(const Asked& asked, Context& context);
    xcb_atom_t atom(std::string_view name);
    std::vector<std::uint32_t> rootItems(std::string_view property);

    XConnection* connection_;
    bool hasManager_ = false;
    std::vector<xcb_window_t> windows_;
    std::vector<xcb_window_t> selected_;  ///< whose events we get
    std::map<std::string, xcb_atom_t, std::less<>> atoms_;
};

}  // namespace kelvo::x11
