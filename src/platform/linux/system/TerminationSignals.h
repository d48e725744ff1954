#pragma once

#include "base/UniqueFd.h"

#include <functional>
#include <thread>

namespace kelvo {

/// Turns SIGTERM, SIGINT and, unless it is ignored, SIGHUP (the terminal was closed) into a call. Made first
/// thing in `main`, before any other thread starts, so that no thread is interrupted by them; ignores
/// SIGPIPE, too, whose cause every write reports anyway.
class TerminationSignals {
  public:
    TerminationSignals();
    ~TerminationSignals();
    TerminationSignals(const TerminationSignals&) = delete;
    TerminationSignals& operator=(const TerminationSignals&) = delete;

    /// Runs `handler` for the first signal, on a thread of its own. Once.
    void watch(std::function<void()> handler);

    /// Ends the process with status 0, wherever it is then, after that many seconds.
    static void exitAfter(unsigned seconds);

  private:
    UniqueFd signals_;
    UniqueFd stopEvent_;
    std::thread watcher_;
};

}  // namespace kelvo
