#include "HostFileSystem.h"

#include <cerrno>
#include <filesystem>

namespace kelvo::test {

bool HostFileSystem::itemExists(std::string_view path) {
    std::error_code ignored;
    return std::filesystem::exists(path, ignored);
}

OptionalError HostFileSystem::removeItem(std::string_view path) {
    std::error_code error;
    std::filesystem::remove(path, error);
    if (error) return KVError::posix(error.value(), path);
    return std::nullopt;
}

KVError HostFileSystem::notHere(std::string_view path) {
    return KVError::posix(ENOSYS, path);
}

}  // namespace kelvo::test
