#pragma once

#include "base/UniqueFd.h"

#include <cstdint>
#include <string>
#include <sys/mman.h>
#include <unistd.h>

namespace kelvo::test {

/// Bytes as a file that lives in memory, for readers that want one.
class MemoryFile {
  public:
    MemoryFile(const std::uint8_t* data, std::size_t size) : file_(::memfd_create("fuzz", MFD_CLOEXEC)) {
        isWhole_ = ::write(file_.get(), data, size) == static_cast<ssize_t>(size);
    }
    /// Whether the file was made.
    explicit operator bool() const { return isWhole_; }
    int descriptor() const { return file_.get(); }
    std::string path() const { return "/proc/self/fd/" + std::to_string(file_.get()); }

  private:
    UniqueFd file_;
    bool isWhole_ = false;
};

}  // namespace kelvo::test
