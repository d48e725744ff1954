#pragma once

#include <string>

namespace kelvo::ctl {

/// The host path of the daemon's socket: `given`, else KELVO_SOCKET, else the user's daemon's if its socket
/// is there, else the system's.
std::string daemonSocket(const std::string& given);

/// The host path of the socket for shells that show alerts, beside that one.
std::string alertSocket(const std::string& given);

/// The host path of the socket of the library's service, beside that one.
std::string librarySocket(const std::string& given);

/// What a person is told when nobody listens there.
std::string howToStart();

}  // namespace kelvo::ctl
