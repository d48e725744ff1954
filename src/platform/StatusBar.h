#pragma once

#include "base/KVError.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

namespace kelvo {

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
