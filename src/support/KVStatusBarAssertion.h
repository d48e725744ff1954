#pragma once

#include "base/Guarded.h"
#include "base/MainQueue.h"
#include "platform/StatusBar.h"

#include <atomic>
#include <cstdint>
#include <memory>
#include <string>

namespace kelvo {

/// Told the time that the status bar shows.
class KVStatusBarAssertionDelegate {
  public:
    virtual ~KVStatusBarAssertionDelegate() = default;
    virtual void timerDidUpdate(const std::string& elapsedTime) = 0;
};

/// The status bar's recording indicator for one process. Queue-bound: the recording manager's queue; the
/// timer belongs to the main queue.
///
/// What to show is taken down here; the shell's style itself cannot be had yet, so that showing ends where a
/// failed acquisition does, without an indicator. What the release gives back is handed in through the
/// accessors.
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

    std::shared_ptr<StatusBarCoordinatorDelegate> delegate() const { return delegate_.copy().lock(); }
    void setDelegate(std::weak_ptr<StatusBarCoordinatorDelegate> delegate) {
        delegate_.set(std::move(delegate));
    }
    std::shared_ptr<KVStatusBarAssertionDelegate> assertionDelegate() const {
        return assertionDelegate_.copy().lock();
    }
    void setAssertionDelegate(std::weak_ptr<KVStatusBarAssertionDelegate> delegate) {
        assertionDelegate_.set(std::move(delegate));
    }
    bool broadcasting() const { return broadcasting_; }
    void setBroadcasting(bool broadcasting) { broadcasting_ = broadcasting; }
    std::string broadcastServiceName() const { return broadcastServiceName_.copy(); }
    void setBroadcastServiceName(std::string name) { broadcastServiceName_.set(std::move(name)); }
    bool microphoneEnabled() const { return microphoneEnabled_; }
    void setMicrophoneEnabled(bool enabled) { microphoneEnabled_ = enabled; }
    bool isPaused() const { return paused_; }

    /// For whom the indicator was last to be shown; 0 before the first time.
    std::int32_t processIdentifier() const { return processIdentifier_; }

    /// Shows the indicator for a process; without the style nothing is shown, which is no error.
    void showDoubleHeightStatusBarWithPid(std::int32_t processIdentifier) {
        processIdentifier_ = processIdentifier;
    }
    /// The duration, in seconds, does not enter the text.
    void updateDoubleHeightStatusBarWithDuration(double duration, bool paused) {
        static_cast<void>(duration);
        paused_ = paused;
    }

    /// Takes the indicator away and stops its timer. Does nothing when no assertion is held, even if a timer
    /// or a coordinator is left.
    void invalidateDoubleHeightStatusBar();

  private:
    Guarded<std::weak_ptr<StatusBarCoordinatorDelegate>> delegate_;
    Guarded<std::weak_ptr<KVStatusBarAssertionDelegate>> assertionDelegate_;
    Guarded<std::string> broadcastServiceName_;
    std::atomic<bool> broadcasting_{false};
    std::atomic<bool> microphoneEnabled_{false};
    std::atomic<bool> paused_{false};
    std::atomic<std::int32_t> processIdentifier_{0};
    std::shared_ptr<StatusBarStyleAssertion> assertion_;
    std::shared_ptr<StatusBarCoordinator> coordinator_;
    std::shared_ptr<RepeatingTimer> timer_;
};

}  // namespace kelvo
