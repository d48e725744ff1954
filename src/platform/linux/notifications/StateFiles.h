#pragma once

#include "base/UniqueFd.h"

#include <cstdint>
#include <string>
#include <vector>

namespace kelvo {

/// A folder whose files are the states of named notifications: a file's name is the notification's, its
/// content the state in decimal digits. Anyone who may write to the folder can post. Queue-bound: the
/// notification thread.
class StateFiles {
  public:
    /// Watches the folder at a host path, making it when it is missing. When that fails nothing ever changes.
    explicit StateFiles(std::string hostFolder);

    /// Becomes readable when files have changed; -1 when nothing is watched.
    int descriptor() const { return inotify_.get(); }

    /// The names of the files that are there.
    std::vector<std::string> names() const;

    /// The names of the files that were written, moved or removed since the last call, each once.
    std::vector<std::string> takeChangedNames();

    /// The state in the file of that name; 0 without the file or when it holds no number.
    std::uint64_t state(const std::string& name) const;

  private:
    std::string folder_;
    UniqueFd inotify_;
};

}  // namespace kelvo
