#pragma once

#include "platform/Platform.h"
#include "session/RecordingSession.h"

#include <functional>

namespace kelvo {

/// The daemon's life: creates the one recording manager, accepts clients, calls `ready` (may be none) and
/// runs the main queue on the calling thread, for ever as far as this function is concerned. Should the loop
/// return, the manager is torn down and the result is the process's exit status, -1.
int runDaemon(const Platform& platform, SessionFactory createSession, const std::function<void()>& ready);

}  // namespace kelvo
