#pragma once

#include "kit/RecorderCore.h"

#include <string>

namespace kelvokit {

/// The environment of a recorder that a program makes: the daemon behind a socket, threads of the library's
/// own, and error texts in the user's language from the installed resources.
RecorderEnvironment localEnvironment(const RecorderOptions& options);

/// The socket that the options name, else the one where a program of this user finds the daemon.
std::string socketPath(const RecorderOptions& options);

}  // namespace kelvokit
