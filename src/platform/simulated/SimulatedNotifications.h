#pragma once

#include "base/Guarded.h"
#include "platform/NotificationRegistry.h"

#include <map>
#include <string>

namespace kelvo {

/// Named notifications that a test posts. Handlers run on the global queues. Thread-safe.
class SimulatedNotifications : public NotificationCenter {
  public:
    NotificationToken registerForNotification(std::string_view name, QueuePriority priority,
                                              Handler handler) override {
        return registry_.add(name, priority, std::move(handler));
    }
    std::uint64_t state(NotificationToken token) override { return registry_.state(token); }
    void removeObservers(std::string_view name) override {
        registry_.remove(name);
        removals_.with([&](auto& removals) { ++removals[std::string(name)]; });
    }

    /// Sets the state of `name` and tells everybody who registered for it.
    void post(std::string_view name, std::uint64_t state) { registry_.post(name, state); }

    std::size_t observerCount(std::string_view name) const { return registry_.count(name); }
    /// How often `removeObservers` was called for `name`.
    int removalCount(std::string_view name) const {
        return removals_.with([&](const auto& removals) {
            const auto entry = removals.find(std::string(name));
            return entry == removals.end() ? 0 : entry->second;
        });
    }

  private:
    NotificationRegistry registry_;
    Guarded<std::map<std::string, int>> removals_;
};

}  // namespace kelvo
