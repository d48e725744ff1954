#pragma once

#include <chrono>
#include <string>
#include <xcb/xcb.h>

namespace kelvo::x11 {

/// What came of connecting to a display; the caller owns the connection.
struct XAttempt {
    xcb_connection_t* connection = nullptr;  ///< none when the display could not be reached
    int screenNumber = 0;
};

/// Connects to `display` as xcb_connect does, but waits for `limit` at most, and not once `interruptFd` (or
/// -1) is readable: a server that stands still takes a connection and never answers. Such a server is not
/// asked anew before it has answered; until then every attempt fails at once. Thread-safe.
XAttempt connectWithin(const std::string& display, std::chrono::milliseconds limit, int interruptFd);

}  // namespace kelvo::x11
