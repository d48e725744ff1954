#pragma once

#include <string>
#include <sys/types.h>
#include <vector>

namespace kelvo::test {

/// A program that runs while this object lives. Its output goes to this process's.
class ChildProcess {
  public:
    /// Starts `arguments` (the program first, looked up in PATH). Descriptors in `inherited` keep their
    /// numbers in the program; no others but the standard ones are passed on.
    explicit ChildProcess(const std::vector<std::string>& arguments, const std::vector<int>& inherited = {});
    /// Kills the program and waits for its end.
    ~ChildProcess();
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    pid_t pid() const { return pid_; }
    void signal(int number) const;
    /// Kills the program, if it still runs, and waits for its end.
    void kill();

  private:
    pid_t pid_ = -1;
};

}  // namespace kelvo::test
