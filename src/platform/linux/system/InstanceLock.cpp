#include "platform/linux/system/InstanceLock.h"

#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <sys/file.h>

namespace kelvo {

Result<InstanceLock> InstanceLock::acquire(const std::string& hostPath) {
    std::error_code code;
    std::filesystem::create_directories(std::filesystem::path(hostPath).parent_path(), code);
    if (code) return KVError::posix(code.value(), hostPath);
    UniqueFd file(::open(hostPath.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600));
    if (!file || ::flock(file.get(), LOCK_EX | LOCK_NB) != 0) return KVError::posix(errno, hostPath);
    return InstanceLock(std::move(file));
}

}  // namespace kelvo
