#pragma once

#include "base/UniqueFd.h"

#include <string_view>

namespace kelvo {

/// The listening socket that the service manager has handed to this process at its start for the service of
/// this name, which is the last part of the socket's path; none when there is none. The manager goes on
/// listening there after this process, so the socket must be neither shut down nor unlinked. Thread-safe.
UniqueFd inheritedSocket(std::string_view serviceName);

}  // namespace kelvo
