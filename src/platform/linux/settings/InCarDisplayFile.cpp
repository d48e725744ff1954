#include "platform/linux/settings/InCarDisplayFile.h"

#include "platform/linux/files/ReadFile.h"

#include <cerrno>
#include <charconv>
#include <cstdint>
#include <string>

namespace kelvo {
namespace {

constexpr std::string_view kStatePath = "/run/kelvod/in-car-display";
constexpr std::size_t kMostStateBytes = 64;

}  // namespace

Result<bool> InCarDisplayFile::isActive() {
    const Result<std::string> content = readFile(root_->hostPath(kStatePath), kMostStateBytes);
    if (!content && content.error().code() == ENOENT) return false;
    if (!content) return content.error();
    std::uint64_t state = 0;
    const auto parsed = std::from_chars(content->data(), content->data() + content->size(), state);
    if (parsed.ec != std::errc()) return KVError::posix(EINVAL, kStatePath);
    return state != 0;
}

}  // namespace kelvo
