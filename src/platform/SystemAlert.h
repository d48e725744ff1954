#pragma once

#include "base/Result.h"

#include <memory>
#include <string>

namespace kelvo {

/// What a system alert shows. A button without a title is not shown.
struct SystemAlertContent {
    std::string header;
    std::string message;
    std::string defaultButton;
    std::string alternateButton;
    std::string otherButton;
    std::string localizationPath;  ///< the bundle that the texts come from; may be empty
};

/// How an alert ended, with the numbers that alerts answer with.
enum class SystemAlertResponse { defaultButton = 0, alternateButton = 1, otherButton = 2, cancelled = 3 };

/// One alert on the screen. Thread-safe.
class SystemAlert {
  public:
    virtual ~SystemAlert() = default;
    /// Blocks until the user answers or `cancel` is called; there is no time-out.
    virtual SystemAlertResponse waitForResponse() = 0;
    /// Takes the alert off the screen. Without effect once it is answered.
    virtual void cancel() = 0;
};

/// Shows alerts above everything else. Implemented by `ShellAlerts`, through a shell process, and by the
/// simulated device. Any thread.
class SystemAlertService {
  public:
    virtual ~SystemAlertService() = default;
    /// Puts an alert on the screen. Fails when nobody can show it.
    virtual Result<std::shared_ptr<SystemAlert>> createAlert(const SystemAlertContent& content) = 0;
    /// Cancels every alert that is up, and creates none from now on: nobody is left to wait for the user.
    virtual void close() = 0;
};

}  // namespace kelvo
