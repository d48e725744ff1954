#include "platform/linux/files/WritableDirectory.h"

#include <cerrno>
#include <filesystem>
#include <unistd.h>

namespace kelvo {

OptionalError makeWritableDirectory(const std::string& hostPath) {
    std::error_code code;
    std::filesystem::create_directories(hostPath, code);
    if (code) return KVError::posix(code.value(), hostPath);
    return ::access(hostPath.c_str(), W_OK) == 0 ? OptionalError() : KVError::posix(errno, hostPath);
}

}  // namespace kelvo
