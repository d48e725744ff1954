#pragma once

#include "support/ChildProcess.h"

#include <memory>
#include <string>

namespace kelvo::test {

/// An X server of its own without a screen to look at, for a test.
class XvfbServer {
  public:
    /// A number that no server takes by itself, for one that is to have a successor: the freed number of
    /// another would at once be the next one's that starts anywhere on the machine.
    static std::string ownDisplay();

    /// Starts a server whose screen has this size and waits until it answers. `display` is ":N" to use that
    /// number, or empty to take a free one; `options` are further ones of the program.
    XvfbServer(int width, int height, const std::string& display = {}, const std::string& options = {});
    ~XvfbServer();
    XvfbServer(const XvfbServer&) = delete;
    XvfbServer& operator=(const XvfbServer&) = delete;

    /// ":N"; empty when the server did not come up.
    const std::string& display() const { return display_; }

    /// SIGKILL, waiting for the end; SIGSTOP; SIGCONT.
    void kill();
    void freeze();
    void thaw();

  private:
    const bool isNumberOurs_;
    std::string display_;
    std::unique_ptr<ChildProcess> process_;
};

}  // namespace kelvo::test
