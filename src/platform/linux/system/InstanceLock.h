#pragma once

#include "base/Result.h"
#include "base/UniqueFd.h"

#include <string>

namespace kelvo {

/// Holds the right to be the only daemon on a device root. Released with the process, however it ends.
class InstanceLock {
  public:
    /// Takes the lock file at a host path, making the folders above it. Fails with EWOULDBLOCK when another
    /// process holds it.
    static Result<InstanceLock> acquire(const std::string& hostPath);

  private:
    explicit InstanceLock(UniqueFd file) : file_(std::move(file)) {}
    UniqueFd file_;
};

}  // namespace kelvo
