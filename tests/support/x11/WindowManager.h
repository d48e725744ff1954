#pragma once

#include "support/ChildProcess.h"

#include <string>

namespace kelvo::test {

/// A window manager (openbox, as Debian sets it up) on the display of a test, until this object goes.
class WindowManager {
  public:
    /// Starts it and waits until windows that appear from now on are its own: while it starts it overlooks
    /// some.
    explicit WindowManager(const std::string& display);

    /// Whether it came up.
    bool isReady() const { return isReady_; }

  private:
    ChildProcess process_;
    bool isReady_ = false;
};

}  // namespace kelvo::test
