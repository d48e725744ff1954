#include "platform/linux/analytics/LineFile.h"

#include "base/UniqueFd.h"
#include "platform/linux/files/WritableDirectory.h"

#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>

namespace kelvo {
namespace {

UniqueFd open(const std::string& path) {
    return UniqueFd(::open(path.c_str(), O_RDWR | O_CREAT | O_APPEND | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK,
                           S_IRUSR | S_IWUSR));
}

/// The size of the open regular file; -1, with the reason in errno, when it is something else.
off_t sizeOf(const UniqueFd& file) {
    struct stat status {};
    if (!file || ::fstat(file.get(), &status) != 0) return -1;
    if (S_ISREG(status.st_mode)) return status.st_size;
    errno = EINVAL;
    return -1;
}

bool endsInsideALine(const UniqueFd& file, off_t size) {
    char last = '\n';
    return size > 0 && ::pread(file.get(), &last, 1, size - 1) == 1 && last != '\n';
}

}  // namespace

OptionalError LineFile::append(const std::string& line) {
    std::string text = line + "\n";
    if (text.size() >= mostBytes_) return KVError::posix(EMSGSIZE, path_);
    if (auto error = makeWritableDirectory(std::filesystem::path(path_).parent_path().string())) return error;
    UniqueFd file = open(path_);
    off_t size = sizeOf(file);
    if (size < 0) return KVError::posix(errno, path_);
    if (static_cast<std::uint64_t>(size) + text.size() > mostBytes_) {
        if (std::rename(path_.c_str(), (path_ + ".old").c_str()) != 0) return KVError::posix(errno, path_);
        file = open(path_);
        size = sizeOf(file);
        if (size < 0) return KVError::posix(errno, path_);
    }
    if (endsInsideALine(file, size)) text.insert(text.begin(), '\n');
    const ssize_t count = ::write(file.get(), text.data(), text.size());
    if (count == static_cast<ssize_t>(text.size())) return std::nullopt;
    const int code = count < 0 ? errno : ENOSPC;
    if (::ftruncate(file.get(), size) != 0) return KVError::posix(errno, path_);
    return KVError::posix(code, path_);
}

}  // namespace kelvo
