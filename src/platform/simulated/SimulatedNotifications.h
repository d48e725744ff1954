#pragma once

#include "base/Guarded.h"
#include "platform/NotificationCenter.h"

#include <map>

namespace kelvo {

/// Named notifications that a test posts. Handlers run on the global queues. Thread-safe.
class SimulatedNotifications : public NotificationCenter {
  public:
    NotificationToken registerForNotification(std::string_view name, QueuePriority priority,
                                              Handler handler) override;
    std::uint64_t state(NotificationToken token) override;
    void removeObservers(std::string_view name) override;

    /// Sets the state of `name` and tells everybody who registered for it.
    void post(std::string_view name, std::uint64_t state);

    std::size_t observerCount(std::string_view name) const;
    /// How often `removeObservers` was called for `name`.
    int removalCount(std::string_view name) const;

  private:
    struct Registration {
        std::string name;
        QueuePriority priority;
        Handler handler;
    };
    struct Center {
        std::map<NotificationToken, Registration> registrations;
        std::map<std::string, std::uint64_t, std::less<>> states;
        std::map<std::string, int, std::less<>> removals;
        NotificationToken lastToken = 0;
    };
    Guarded<Center> center_;
};

}  // namespace kelvo
