#pragma once

#include <string>
#include <string_view>

namespace kelvo::test {

/// A fresh folder that goes, with what is in it, when this object goes.
class TemporaryDirectory {
  public:
    TemporaryDirectory();
    ~TemporaryDirectory();
    TemporaryDirectory(const TemporaryDirectory&) = delete;
    TemporaryDirectory& operator=(const TemporaryDirectory&) = delete;

    const std::string& path() const { return path_; }

    /// Writes a file below the folder, making the folders above it; returns its path.
    std::string write(std::string_view relativePath, std::string_view content) const;

  private:
    std::string path_;
};

}  // namespace kelvo::test
