#pragma once

#include "platform/Platform.h"
#include "session/RecordingSession.h"

#include <chrono>
#include <functional>

namespace kelvo {

/// The daemon's life: creates the one recording manager, accepts clients, calls `ready` (may be none) and
/// runs the main queue on the calling thread, for ever as far as this function is concerned. Should the loop
/// return, the manager is torn down and the result is the process's exit status, -1.
int runDaemon(const Platform& platform, SessionFactory createSession, const std::function<void()>& ready);

/// Ends a daemon that runs: what is up for the user to answer is cancelled, recordings are finished and saved
/// as far as that takes no longer than `patience`, then the main queue stops. From any thread but the main
/// one; blocks for as long.
void endDaemon(const Platform& platform, std::chrono::nanoseconds patience);

}  // namespace kelvo
