#pragma once

#include "platform/FileSystem.h"

namespace kelvo::test {

/// The machine's own files, without a device root. Only what movie writing needs of it does something.
class HostFileSystem : public FileSystem {
  public:
    bool itemExists(std::string_view path) override;
    OptionalError removeItem(std::string_view path) override;
    std::string hostPath(std::string_view path) override { return std::string(path); }

    OptionalError createDirectory(std::string_view path) override { return notHere(path); }
    Result<std::vector<std::string>> namesInDirectory(std::string_view path) override {
        return notHere(path);
    }
    Result<FileAttributes> attributesOfItem(std::string_view path) override { return notHere(path); }
    OptionalError moveItem(std::string_view source, std::string_view) override { return notHere(source); }
    Result<std::uint64_t> freeSpace(std::string_view path) override { return notHere(path); }

  private:
    static KVError notHere(std::string_view path);
};

}  // namespace kelvo::test
