#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace kelvo {

/// The states of an application that somebody looks at; every other number means that the application runs
/// where the user does not see it.
enum ApplicationState : std::int32_t {
    kApplicationStateUnknown = 0,
    kApplicationStateTerminated = 1,
    kApplicationStateBackground = 4,
    kApplicationStateForeground = 8,
    kApplicationStateForegroundObscured = 32,  ///< on the screen behind something of the system
};

/// What the system knows of one application.
struct ApplicationInformation {
    std::int32_t state = kApplicationStateUnknown;
    std::int32_t processIdentifier = 0;  ///< 0 when unknown
    bool isFrontmost = false;
    std::string bundleIdentifier;
};

/// Knows which applications run and which of them the user sees. Implemented by the Linux adapter (the window
/// manager's properties on the X server) and the simulated device. Any thread.
class ApplicationStateSource {
  public:
    using UpdateHandler = std::function<void(const ApplicationInformation&)>;
    using InformationHandler = std::function<void(const std::optional<ApplicationInformation>&)>;

    virtual ~ApplicationStateSource() = default;

    /// Calls `handler` with each change of an application's state or of the frontmost application (the one
    /// that lost its place as well as the one that took it), one at a time, on the source's own queue. There
    /// is one handler: a new one replaces the last, an empty one ends the watch; a call that is under way is
    /// finished.
    virtual void setUpdateHandler(UpdateHandler handler) = 0;

    /// What is known of a process now; none when it is no application or is gone.
    virtual std::optional<ApplicationInformation> informationOfProcess(std::int32_t processIdentifier) = 0;

    /// What is known of an application, given to `handler` on the source's own queue; none when it does not
    /// run.
    virtual void informationOfApplication(std::string_view bundleIdentifier, InformationHandler handler) = 0;

    /// The application's state now; unknown when it does not run.
    virtual std::int32_t stateOfApplication(std::string_view bundleIdentifier) = 0;

    /// The bundle identifier of the application that has the user's input; none when no application has it.
    virtual std::optional<std::string> frontmostApplicationBundleIdentifier() = 0;
};

}  // namespace kelvo
