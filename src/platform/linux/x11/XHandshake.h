#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <xcb/xcb.h>

namespace kelvo::x11 {

/// Connects to the server of `display` (":0"; empty takes $DISPLAY), which must be on this machine, and gives
/// up when `interruptFd` (-1 for none) becomes readable or when the server has not answered within `limit`.
/// None when that did not come to a connection; `screen` is the number of the screen that the name asks for.
/// The caller disconnects.
xcb_connection_t* connectTo(const std::string& display, int& screen, int interruptFd,
                            std::optional<std::chrono::milliseconds> limit);

/// `display`, or what $DISPLAY names when it is empty; empty when nothing does.
std::string displayName(const std::string& display);

/// What a log says of a display of that name which cannot be reached. Any thread.
std::string unreachableText(const std::string& displayName);

}  // namespace kelvo::x11
