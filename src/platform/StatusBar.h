#pragma once

#include "base/KVError.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

namespace kelvo {

/// Told what the system does to the registered styles. On a thread of the status bar's service.
class StatusBarCoordinatorDelegate {
  public:
    virtual ~StatusBarCoordinatorDelegate() = default;
    /// The system withdrew the styles.
    virtual void statusBarCoordinatorInvalidatedRegistrationWithError(const OptionalError& error) = 0;
};

/// The right to style the status bar for one process. Any thread.
class StatusBarStyleAssertion {
  public:
    virtual ~StatusBarStyleAssertion() = default;
    virtual std::string statusString() = 0;
    virtual void setStatusString(std::string text) = 0;
    virtual void invalidate() = 0;
};

/// Registers which styles this process overrides. Any thread.
class StatusBarCoordinator {
  public:
    virtual ~StatusBarCoordinator() = default;
    /// `reply` may be none.
    virtual void setRegisteredStyleOverrides(std::uint32_t styleBits, ErrorHandler reply) = 0;
};

}  // namespace kelvo
