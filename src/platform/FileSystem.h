#pragma once

#include "base/Date.h"
#include "base/Result.h"

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace kelvo {

/// What the file system tells about one item. A symbolic link is described itself, not what it points to.
struct FileAttributes {
    std::uint64_t size = 0;  ///< bytes; of a directory, what the file system reports for its entry
    Date modificationDate;
    Date creationDate;  ///< the modification date where the file system keeps no creation date
    bool isDirectory = false;
};

/// The device's files, under the absolute paths that the logic knows. Implemented by the Linux adapter, which
/// finds them under the device root, and by the simulated device, which keeps them in memory. Called from any
/// thread, concurrently; each operation acts on the file system at once and blocks for as long as that takes.
/// Two operations on one file race as the file system lets them. Errors are in the POSIX domain.
class FileSystem {
  public:
    virtual ~FileSystem() = default;

    /// Whether anything, of whatever kind, stands at `path`.
    virtual bool itemExists(std::string_view path) = 0;

    /// Creates the directory and those above it that are missing. A directory that exists already is no
    /// error.
    virtual OptionalError createDirectory(std::string_view path) = 0;

    /// The names in a directory, without "." and "..", in alphabetical order.
    virtual Result<std::vector<std::string>> namesInDirectory(std::string_view path) = 0;

    virtual Result<FileAttributes> attributesOfItem(std::string_view path) = 0;

    /// Removes a file, a link, or a directory with what it holds.
    virtual OptionalError removeItem(std::string_view path) = 0;

    /// Moves an item, across volumes when it must. Fails with EEXIST when something stands at the
    /// destination.
    virtual OptionalError moveItem(std::string_view source, std::string_view destination) = 0;

    /// Bytes that this process may still write to the volume that holds `path`.
    virtual Result<std::uint64_t> freeSpace(std::string_view path) = 0;

    /// The path under which any process of this machine finds the item at `path`.
    virtual std::string hostPath(std::string_view path) = 0;
};

}  // namespace kelvo
