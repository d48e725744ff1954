#pragma once

#include "base/GlobalQueue.h"

#include <cstdint>
#include <functional>
#include <string_view>

namespace kelvo {

/// Told that the screen went blank (state 1) or came back (state 0).
inline constexpr std::string_view kBlankedScreenNotification = "com.quillon.plinth.hasBlankedScreen";

/// Identifies one registration; 0 is none.
using NotificationToken = std::int32_t;

/// The system's named notifications, each with a 64-bit state. Implemented by the Linux adapter (the login
/// manager's lock state and watched state files) and the simulated device. Any thread.
class NotificationCenter {
  public:
    using Handler = std::function<void(NotificationToken)>;

    virtual ~NotificationCenter() = default;

    /// Runs `handler` on the global queue of `priority` each time the notification `name` fires. A
    /// notification that nobody can post never fires; registering for it is no error.
    virtual NotificationToken registerForNotification(std::string_view name, QueuePriority priority,
                                                      Handler handler) = 0;

    /// The state that was last posted with the token's notification; 0 when none was.
    virtual std::uint64_t state(NotificationToken token) = 0;

    /// Ends every registration for `name`; a handler that runs now is finished. Unknown names are no error.
    virtual void removeObservers(std::string_view name) = 0;
};

}  // namespace kelvo
