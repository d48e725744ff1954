#pragma once

namespace kelvo {

/// Will follow which applications are in the foreground. Observes nothing yet: nothing can be recorded that
/// would have to be paused.
class KVApplicationStateMonitor {};

}  // namespace kelvo
