#include "platform/linux/files/LinuxFileSystem.h"

#include "platform/linux/files/RenameFile.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <system_error>

namespace kelvo {
namespace {

namespace fs = std::filesystem;

OptionalError errorFrom(const std::error_code& code, std::string_view path) {
    return code ? OptionalError(KVError::posix(code.value(), path)) : std::nullopt;
}

Date dateFrom(const statx_timestamp& time) {
    return {time.tv_sec * 1000000000LL + time.tv_nsec};
}

/// Moves an item to another volume. What was copied is removed again when the copy fails.
OptionalError moveAcrossVolumes(const std::string& from, const std::string& to, std::string_view path) {
    std::error_code code;
    fs::copy(from, to, fs::copy_options::recursive | fs::copy_options::copy_symlinks, code);
    if (code) {
        std::error_code ignored;
        fs::remove_all(to, ignored);
        return errorFrom(code, path);
    }
    fs::remove_all(from, code);
    return errorFrom(code, path);
}

}  // namespace

bool LinuxFileSystem::itemExists(std::string_view path) {
    struct stat status {};
    return ::lstat(hostPath(path).c_str(), &status) == 0;
}

OptionalError LinuxFileSystem::createDirectory(std::string_view path) {
    std::error_code code;
    fs::create_directories(hostPath(path), code);
    return errorFrom(code, path);
}

Result<std::vector<std::string>> LinuxFileSystem::namesInDirectory(std::string_view path) {
    std::error_code code;
    std::vector<std::string> names;
    for (fs::directory_iterator entry(hostPath(path), code), end; !code && entry != end;
         entry.increment(code)) {
        names.push_back(entry->path().filename().string());
    }
    if (code) return *errorFrom(code, path);
    std::sort(names.begin(), names.end());
    return names;
}

Result<FileAttributes> LinuxFileSystem::attributesOfItem(std::string_view path) {
    struct statx status {};
    const unsigned wanted = STATX_TYPE | STATX_SIZE | STATX_MTIME | STATX_BTIME;
    if (::statx(AT_FDCWD, hostPath(path).c_str(), AT_SYMLINK_NOFOLLOW, wanted, &status) != 0) {
        return KVError::posix(errno, path);
    }
    FileAttributes attributes;
    attributes.size = status.stx_size;
    attributes.modificationDate = dateFrom(status.stx_mtime);
    attributes.creationDate =
        dateFrom((status.stx_mask & STATX_BTIME) != 0 ? status.stx_btime : status.stx_mtime);
    attributes.isDirectory = S_ISDIR(status.stx_mode);
    return attributes;
}

OptionalError LinuxFileSystem::removeItem(std::string_view path) {
    std::error_code code;
    const auto count = fs::remove_all(hostPath(path), code);
    if (!code && count == 0) return KVError::posix(ENOENT, path);
    return errorFrom(code, path);
}

OptionalError LinuxFileSystem::moveItem(std::string_view source, std::string_view destination) {
    const std::string from = hostPath(source);
    const std::string to = hostPath(destination);
    const int code = renameWithoutReplacing(from, to);
    if (code == EXDEV) {
        if (itemExists(destination)) return KVError::posix(EEXIST, destination);
        return moveAcrossVolumes(from, to, destination);
    }
    if (code == 0) return std::nullopt;
    return KVError::posix(code, code == EEXIST ? destination : source);
}

Result<std::uint64_t> LinuxFileSystem::freeSpace(std::string_view path) {
    struct statvfs status {};
    if (::statvfs(hostPath(path).c_str(), &status) != 0) return KVError::posix(errno, path);
    return static_cast<std::uint64_t>(status.f_bavail) * status.f_frsize;
}

}  // namespace kelvo
