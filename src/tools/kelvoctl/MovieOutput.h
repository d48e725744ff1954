#pragma once

#include "base/KVError.h"

#include <string>

namespace kelvo::ctl {

/// Whether a new file can be made at `output`; nothing is made yet.
OptionalError checkOutput(const std::string& output);

/// Puts the daemon's movie at `output`, which appears as a whole or not at all: moved where that is possible,
/// else copied. The movie is looked for at the URL's path, and under the root of a daemon whose socket is
/// `socket`.
OptionalError takeMovie(const URL& movie, const std::string& socket, const std::string& output);

}  // namespace kelvo::ctl
