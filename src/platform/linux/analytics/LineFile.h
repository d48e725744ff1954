#pragma once

#include "base/KVError.h"

#include <cstdint>
#include <string>

namespace kelvo {

/// A file that grows by whole lines and never beyond a bound: when it is full it becomes "<name>.old", in
/// place of the one before, and begins anew. A line that a crash cut stays alone on its line. One thread at a
/// time.
class LineFile {
  public:
    /// Nothing is touched until a line is written. `mostBytes` bounds one of the two files.
    LineFile(std::string hostPath, std::uint64_t mostBytes)
        : path_(std::move(hostPath)), mostBytes_(mostBytes) {}

    /// Adds `line`, which has no line break, making the folders above the file. Fails with EMSGSIZE for a
    /// line that no file would hold; nothing of a line that failed is left, if the disk permits.
    OptionalError append(const std::string& line);

  private:
    const std::string path_;
    const std::uint64_t mostBytes_;
};

}  // namespace kelvo
