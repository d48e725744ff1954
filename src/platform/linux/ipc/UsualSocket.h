#pragma once

#include <string>

namespace kelvo {

/// Where a program finds the daemon that serves its user: the socket that KELVO_SOCKET names, else the one of
/// the user's own daemon (below XDG_RUNTIME_DIR) if it is there, else the device's. Reads the environment,
/// which no other thread may change at this time.
std::string usualDaemonSocket();

}  // namespace kelvo
