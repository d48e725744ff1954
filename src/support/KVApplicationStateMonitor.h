#pragma once

#include "platform/ApplicationState.h"

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string_view>

namespace kelvo {

/// Told when a client application leaves the screen or comes back. On the application-state source's queue;
/// implementations do not wait there.
class KVApplicationStateObserver {
  public:
    virtual ~KVApplicationStateObserver() = default;
    virtual void clientApplicationDidEnterBackground() = 0;
    virtual void clientApplicationDidEnterForeground() = 0;
};

/// Told which application the user has in front. On the application-state source's queue; implementations do
/// not wait there.
class KVSystemStateObserver {
  public:
    virtual ~KVSystemStateObserver() = default;
    virtual void frontmostApplicationDidChange(std::int32_t processIdentifier) = 0;
    virtual void frontmostApplicationWasTerminated(std::int32_t processIdentifier) = 0;
    virtual void frontmostApplicationDidEnterBackground(std::int32_t processIdentifier) = 0;
};

/// Makes two kinds of events of the platform's application states: a client's way to the background and back,
/// for the recording of that client, and changes of the frontmost application, for the recording of the whole
/// screen. Listens to the source exactly while somebody observes. Holds its observers strongly. Thread-safe:
/// observers are called without a lock.
class KVApplicationStateMonitor : public std::enable_shared_from_this<KVApplicationStateMonitor> {
  public:
    explicit KVApplicationStateMonitor(std::shared_ptr<ApplicationStateSource> source)
        : source_(std::move(source)) {}
    /// Listens no longer.
    ~KVApplicationStateMonitor();
    KVApplicationStateMonitor(const KVApplicationStateMonitor&) = delete;
    KVApplicationStateMonitor& operator=(const KVApplicationStateMonitor&) = delete;

    /// Observes one process from its present state on; replaces that process's earlier observer.
    void addObserver(std::shared_ptr<KVApplicationStateObserver> observer, std::int32_t processIdentifier);
    void removeObserverWithProcessIdentifier(std::int32_t processIdentifier);

    /// There is one system observer: a new one replaces the last.
    void addSystemObserver(std::shared_ptr<KVSystemStateObserver> observer);
    void removeSystemObserver();

    std::size_t observersCount() const;

    /// Gives `completion` the process of the frontmost application: -1, at once, when no application is in
    /// front; else, on the source's queue, its identifier, 0 when that is unknown.
    void frontmostApplicationProcessIdentifier(std::function<void(std::int32_t)> completion);

    /// Whether the application is on the screen with nothing above it.
    bool isApplicationInForegroundWithBundleIdentifier(std::string_view bundleIdentifier) const;

  private:
    using States = std::map<std::int32_t, std::int32_t>;

    void updateSubscription();
    void applicationStateDidChange(const ApplicationInformation& update);
    void handleApplicationStateChange(KVSystemStateObserver& observer, const ApplicationInformation& update);
    void notifyInAppSessionShouldPauseOrResume(const ApplicationInformation& update);
    bool hasObservers() const;
    States previousState() const;

    const std::shared_ptr<ApplicationStateSource> source_;
    mutable std::mutex mutex_;
    /// Orders changes of the subscription; never taken by the source's queue.
    std::mutex subscriptionMutex_;
    bool isSubscribed_ = false;  // under the subscription's lock
    std::map<std::int32_t, std::shared_ptr<KVApplicationStateObserver>> observers_;
    States previousState_;
    std::shared_ptr<KVSystemStateObserver> systemObserver_;
};

}  // namespace kelvo
