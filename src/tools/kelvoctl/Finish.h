#pragma once

#include "tools/kelvoctl/Program.h"

namespace kelvo::ctl {

/// Asks the daemon to stop the recording, then saves the movie to the library or puts it where the command
/// line says, tells so and ends the program. `seconds` is how long it ran, when that is known.
void stopAndKeep(Program& program, std::optional<double> seconds);

}  // namespace kelvo::ctl
