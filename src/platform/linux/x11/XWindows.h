#pragma once

#include "platform/linux/x11/XConnection.h"

#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>
#include <xcb/res.h>

namespace kelvo::x11 {

/// Whether the server can tell who made a window, and answers.
bool canTellCreators(XConnection& connection);

/// The process that made a window, by what the X server itself knows of its clients; what windows say about
/// themselves is not believed. Of a server of which `canTellCreators` holds. One thread at a time, as the
/// connection.
std::optional<std::int32_t> creatorOf(XConnection& connection, xcb_window_t window);

/// The same in two steps, for many windows at once.
xcb_res_query_client_ids_cookie_t askCreator(XConnection& connection, xcb_window_t window);
std::optional<std::int32_t> creatorIn(XConnection& connection, xcb_res_query_client_ids_cookie_t asked);

/// The window by which a running window manager shows that it runs; a dead one leaves a name of a window
/// that no longer names itself. XCB_NONE without one.
xcb_window_t windowManagersWindow(XConnection& connection);

/// The 32-bit items of a property of any type, 4096 at most; empty when it is not there.
std::vector<std::uint32_t> itemsIn(XConnection& connection, xcb_window_t window, std::string_view property);

}  // namespace kelvo::x11
