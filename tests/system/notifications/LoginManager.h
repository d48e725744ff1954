#pragma once

#include "support/ChildProcess.h"

#include <csignal>
#include <optional>
#include <string>

namespace kelvo::test {

/// A system bus of its own with a login manager on it that has one session, "c1", and does what the test
/// tells it.
class LoginManager {
  public:
    /// Keeps the bus's socket in `folder`. Check `isRunning` before anything else.
    explicit LoginManager(const std::string& folder);

    bool isRunning() const { return isRunning_; }
    const std::string& busAddress() const { return address_; }

    /// The session's lock is set or taken away; false when the manager did not answer.
    bool setLocked(bool isLocked) const;

    /// The bus dies.
    void killBus() const { bus_.signal(SIGKILL); }

  private:
    bool waitUntilItAnswers() const;
    bool send(const std::string& path, const std::string& method, const std::string& arguments) const;

    const std::string address_;
    ChildProcess bus_;
    std::optional<ChildProcess> manager_;
    bool isRunning_ = false;
};

}  // namespace kelvo::test
