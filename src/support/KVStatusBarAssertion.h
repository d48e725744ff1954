#pragma once

#include "base/MainQueue.h"
#include "platform/StatusBar.h"

#include <memory>

namespace kelvo {

/// The status bar's recording indicator for one process. Queue-bound: the recording manager's queue; the
/// timer belongs to the main queue.
///
/// Only the release is here yet; what it releases is handed in through the accessors.
class KVStatusBarAssertion {
  public:
    void setAssertion(std::shared_ptr<StatusBarStyleAssertion> assertion) {
        assertion_ = std::move(assertion);
    }
    void setCoordinator(std::shared_ptr<StatusBarCoordinator> coordinator) {
        coordinator_ = std::move(coordinator);
    }
    void setTimer(std::shared_ptr<RepeatingTimer> timer) { timer_ = std::move(timer); }
    const std::shared_ptr<StatusBarStyleAssertion>& assertion() const { return assertion_; }
    const std::shared_ptr<StatusBarCoordinator>& coordinator() const { return coordinator_; }
    const std::shared_ptr<RepeatingTimer>& timer() const { return timer_; }

    /// Takes the indicator away and stops its timer. Does nothing when no assertion is held, even if a timer
    /// or a coordinator is left.
    void invalidateDoubleHeightStatusBar();

  private:
    std::shared_ptr<StatusBarStyleAssertion> assertion_;
    std::shared_ptr<StatusBarCoordinator> coordinator_;
    std::shared_ptr<RepeatingTimer> timer_;
};

}  // namespace kelvo
