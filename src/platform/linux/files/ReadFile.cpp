#include "platform/linux/files/ReadFile.h"

#include "base/UniqueFd.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>

namespace kelvo {

Result<std::string> readFile(const std::string& hostPath, std::size_t mostBytes) {
    const UniqueFd file(::open(hostPath.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    if (!file) return KVError::posix(errno, hostPath);
    struct stat status {};
    if (::fstat(file.get(), &status) != 0) return KVError::posix(errno, hostPath);
    if (!S_ISREG(status.st_mode)) return KVError::posix(S_ISDIR(status.st_mode) ? EISDIR : EINVAL, hostPath);
    const auto size = static_cast<std::size_t>(status.st_size);
    if (size > mostBytes) return KVError::posix(EFBIG, hostPath);
    std::string content(size, '\0');
    std::size_t filled = 0;
    while (filled < size) {
        const ssize_t count = ::read(file.get(), content.data() + filled, size - filled);
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) return KVError::posix(errno, hostPath);
        if (count == 0) break;  // cut while we read: what is left is the content
        filled += static_cast<std::size_t>(count);
    }
    content.resize(filled);
    return content;
}

}  // namespace kelvo
