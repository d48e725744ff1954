#pragma once

#include "support/ChildProcess.h"

#include <memory>
#include <string>

namespace kelvo::test {

/// An X server of its own without a screen to look at, for a test.
class XvfbServer {
  public:
    /// Starts a server whose screen has this size and waits until it answers. `display` is ":N" to use that
    /// number, or empty to take a free one; `options` are further ones of the program.
    XvfbServer(int width, int height, const std::string& display = {}, const std::string& options = {});

    /// ":N"; empty when the server did not come up.
    const std::string& display() const { return display_; }

    /// SIGKILL, waiting for the end; SIGSTOP; SIGCONT.
    void kill();
    void freeze();
    void thaw();

  private:
    std::string display_;
    std::unique_ptr<ChildProcess> process_;
};

}  // namespace kelvo::test
