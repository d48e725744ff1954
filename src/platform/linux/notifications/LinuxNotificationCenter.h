#pragma once

#include "base/Guarded.h"
#include "base/UniqueFd.h"
#include "platform/NotificationRegistry.h"
#include "platform/linux/files/DeviceRoot.h"

#include <memory>
#include <thread>

namespace kelvo {

class LoginSession;
class StateFiles;

/// Named notifications on Linux. The blanked screen is the session's lock state where a login manager tells
/// it; any other notification, and that one elsewhere, is a file of the notification's name in
/// "/run/kelvod/notifications" under the device root, whose decimal content is the state: it fires each time
/// the file is written or removed.
///
/// Thread-safe. One thread of its own watches, from the first registration on.
class LinuxNotificationCenter : public NotificationCenter {
  public:
    explicit LinuxNotificationCenter(std::shared_ptr<const DeviceRoot> root);
    ~LinuxNotificationCenter() override;

    NotificationToken registerForNotification(std::string_view name, QueuePriority priority,
                                              Handler handler) override;
    std::uint64_t state(NotificationToken token) override;
    void removeObservers(std::string_view name) override;

  private:
    void watch();
    void postInitialStates(const StateFiles& files, const LoginSession* session);
    void handleLoginSession(std::unique_ptr<LoginSession>& session);
    void handleStateFiles(StateFiles& files, bool hasLoginSession);

    const std::shared_ptr<const DeviceRoot> root_;
    UniqueFd stopEvent_;
    NotificationRegistry registry_;
    Guarded<std::thread> watcher_;
};

}  // namespace kelvo
