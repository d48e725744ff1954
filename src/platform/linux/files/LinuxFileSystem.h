#pragma once

#include "platform/FileSystem.h"
#include "platform/linux/files/DeviceRoot.h"

#include <memory>

namespace kelvo {

/// The host's files under the device root. Thread-safe.
class LinuxFileSystem : public FileSystem {
  public:
    explicit LinuxFileSystem(std::shared_ptr<const DeviceRoot> root) : root_(std::move(root)) {}

    bool itemExists(std::string_view path) override;
    OptionalError createDirectory(std::string_view path) override;
    Result<std::vector<std::string>> namesInDirectory(std::string_view path) override;
    Result<FileAttributes> attributesOfItem(std::string_view path) override;
    OptionalError removeItem(std::string_view path) override;
    OptionalError moveItem(std::string_view source, std::string_view destination) override;
    Result<std::uint64_t> freeSpace(std::string_view path) override;
    std::string hostPath(std::string_view path) override { return root_->hostPath(path); }

  private:
    std::shared_ptr<const DeviceRoot> root_;
};

}  // namespace kelvo
