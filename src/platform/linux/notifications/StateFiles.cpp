#include "platform/linux/notifications/StateFiles.h"

#include "platform/linux/files/ReadFile.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <cstring>
#include <filesystem>
#include <sys/inotify.h>
#include <unistd.h>
#include <utility>

namespace kelvo {
namespace {

constexpr std::size_t kMostBytes = 64;
constexpr std::uint32_t kChanges = IN_CLOSE_WRITE | IN_MOVED_TO | IN_MOVED_FROM | IN_DELETE;

}  // namespace

StateFiles::StateFiles(std::string hostFolder) : folder_(std::move(hostFolder)) {
    std::error_code ignored;
    std::filesystem::create_directories(folder_, ignored);
    inotify_.reset(::inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
    if (inotify_ && ::inotify_add_watch(inotify_.get(), folder_.c_str(), kChanges) < 0) inotify_.reset();
}

std::vector<std::string> StateFiles::names() const {
    std::vector<std::string> names;
    std::error_code code;
    for (std::filesystem::directory_iterator entry(folder_, code), end; !code && entry != end;
         entry.increment(code)) {
        names.push_back(entry->path().filename().string());
    }
    return names;
}

std::vector<std::string> StateFiles::takeChangedNames() {
    std::vector<std::string> names;
    alignas(inotify_event) std::array<char, 4096> buffer;
    ssize_t length = 0;
    while ((length = ::read(inotify_.get(), buffer.data(), buffer.size())) > 0) {
        for (std::size_t i = 0; i < static_cast<std::size_t>(length);) {
            const auto* event = reinterpret_cast<const inotify_event*>(buffer.data() + i);
            if (event->len > 0) names.emplace_back(event->name);
            i += sizeof(inotify_event) + event->len;
        }
    }
    std::sort(names.begin(), names.end());
    names.erase(std::unique(names.begin(), names.end()), names.end());
    return names;
}

std::uint64_t StateFiles::state(const std::string& name) const {
    const std::string content = readFile(folder_ + "/" + name, kMostBytes).valueOr("");
    std::uint64_t state = 0;
    const auto parsed = std::from_chars(content.data(), content.data() + content.size(), state);
    return parsed.ec == std::errc() ? state : 0;
}

}  // namespace kelvo
