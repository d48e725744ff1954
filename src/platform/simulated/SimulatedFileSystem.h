#pragma once

#include "base/Clock.h"
#include "base/Guarded.h"
#include "platform/FileSystem.h"
#include "platform/simulated/SimulatedFaults.h"

#include <map>

namespace kelvo {

/// A file system in memory: items with sizes and dates, but no bytes. Doubled slashes count as one.
/// Thread-safe.
class SimulatedFileSystem : public FileSystem {
  public:
    SimulatedFileSystem(std::shared_ptr<Clock> clock, std::shared_ptr<SimulatedFaults> faults);

    /// Puts a file of `size` bytes, last changed `age` ago, at `path`, with the directories above it.
    void addFile(std::string_view path, std::uint64_t size, std::chrono::nanoseconds age = {});
    void setFreeSpace(std::uint64_t bytes);

    bool itemExists(std::string_view path) override;
    OptionalError createDirectory(std::string_view path) override;
    Result<std::vector<std::string>> namesInDirectory(std::string_view path) override;
    Result<FileAttributes> attributesOfItem(std::string_view path) override;
    OptionalError removeItem(std::string_view path) override;
    OptionalError moveItem(std::string_view source, std::string_view destination) override;
    Result<std::uint64_t> freeSpace(std::string_view path) override;
    std::string hostPath(std::string_view path) override { return std::string(path); }

  private:
    /// Every item by its path, without a trailing slash; the root is the empty path.
    using Items = std::map<std::string, FileAttributes>;
    struct Volume {
        Items items;
        std::uint64_t freeSpace = 1000000000;
    };

    OptionalError addDirectories(Items& items, const std::string& path) const;

    std::shared_ptr<Clock> clock_;
    std::shared_ptr<SimulatedFaults> faults_;
    Guarded<Volume> volume_;
};

}  // namespace kelvo
