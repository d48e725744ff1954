#pragma once

#include "base/UniqueFd.h"

#include <chrono>
#include <map>
#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

namespace kelvo::test {

/// A program as its own process, whose standard error a test reads line by line. Killed when this object
/// goes.
class ChildProcess {
  public:
    /// Starts `command` with these variables set in its environment, on top of this process's own.
    explicit ChildProcess(const std::vector<std::string>& command,
                          const std::map<std::string, std::string>& environment = {});
    ~ChildProcess();
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    pid_t processIdentifier() const { return processIdentifier_; }

    /// Reads standard error until a line contains `text`; false when it ends or ten seconds pass first.
    bool waitForLine(const std::string& text);
    /// Everything of standard error that was read so far.
    const std::string& output() const { return output_; }

    void signal(int number) const;

    /// Waits for the end, reading standard error meanwhile; the exit status, or none when a signal ended it
    /// or ten seconds pass first. Once there was an end, none.
    std::optional<int> waitForExit();

  private:
    using Deadline = std::chrono::steady_clock::time_point;
    bool readMore(Deadline deadline);

    pid_t processIdentifier_ = -1;
    UniqueFd standardError_;
    std::string output_;
};

}  // namespace kelvo::test
