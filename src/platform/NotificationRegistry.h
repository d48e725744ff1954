#pragma once

#include "base/Guarded.h"
#include "platform/NotificationCenter.h"

#include <map>
#include <memory>
#include <string>

namespace kelvo {

/// Who registered for which notification, and the states that were posted: what every notification center
/// keeps. Thread-safe.
class NotificationRegistry {
  public:
    NotificationToken add(std::string_view name, QueuePriority priority, NotificationCenter::Handler handler);

    /// The state last posted with the token's notification; 0 when none was, or for an unknown token.
    std::uint64_t state(NotificationToken token) const;

    /// Ends the registrations for `name`. A handler that is queued but has not begun does not run any more.
    void remove(std::string_view name);

    /// Sets the state of `name` and queues the handlers of everybody who registered for it.
    void post(std::string_view name, std::uint64_t state);

    std::size_t count(std::string_view name) const;

  private:
    struct Registration {
        std::string name;
        QueuePriority priority;
        NotificationCenter::Handler handler;
    };
    struct Content {
        std::map<NotificationToken, Registration> registrations;
        std::map<std::string, std::uint64_t, std::less<>> states;
        NotificationToken lastToken = 0;
    };
    static void run(const Guarded<Content>& content, NotificationToken token);

    /// Shared with the handlers that are queued.
    std::shared_ptr<Guarded<Content>> content_ = std::make_shared<Guarded<Content>>();
};

}  // namespace kelvo
