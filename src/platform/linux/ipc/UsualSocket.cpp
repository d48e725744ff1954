#include "platform/linux/ipc/UsualSocket.h"

#include <cstdlib>
#include <filesystem>

namespace kelvo {
namespace {

constexpr const char* kSocketInRuntimeFolder = "/kelvod/com.quillon.kelvod";

std::string environment(const char* name) {
    const char* const value = std::getenv(name);  // NOLINT(concurrency-mt-unsafe): the caller's promise
    return value != nullptr ? value : "";
}

}  // namespace

std::string usualDaemonSocket() {
    if (std::string path = environment("KELVO_SOCKET"); !path.empty()) return path;
    if (const std::string folder = environment("XDG_RUNTIME_DIR"); !folder.empty()) {
        std::string path = folder + kSocketInRuntimeFolder;
        std::error_code ignored;
        if (std::filesystem::exists(path, ignored)) return path;
    }
    return std::string("/run") + kSocketInRuntimeFolder;
}

}  // namespace kelvo
