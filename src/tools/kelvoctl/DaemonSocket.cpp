#include "tools/kelvoctl/DaemonSocket.h"

#include <cstdlib>
#include <filesystem>

namespace kelvo::ctl {
namespace {

constexpr const char* kSocketInRuntimeFolder = "/kelvod/com.quillon.kelvod";

/// Read before any thread could change the environment.
std::string environment(const char* name) {
    const char* const value = std::getenv(name);  // NOLINT(concurrency-mt-unsafe)
    return value != nullptr ? value : "";
}

}  // namespace

std::string daemonSocket(const std::string& given) {
    if (!given.empty()) return given;
    if (std::string path = environment("KELVO_SOCKET"); !path.empty()) return path;
    if (const std::string folder = environment("XDG_RUNTIME_DIR"); !folder.empty()) {
        std::string path = folder + kSocketInRuntimeFolder;
        std::error_code ignored;
        if (std::filesystem::exists(path, ignored)) return path;
    }
    return std::string("/run") + kSocketInRuntimeFolder;
}

std::string alertSocket(const std::string& given) {
    return daemonSocket(given) + ".alerts";
}

std::string librarySocket(const std::string& given) {
    return daemonSocket(given) + ".library";
}

std::string howToStart() {
    return "Start it with `kelvod --root DIR` and give --socket DIR/run/kelvod/com.quillon.kelvod (or set "
           "KELVO_SOCKET),\nor `systemctl --user start kelvod.socket` where it is installed.";
}

}  // namespace kelvo::ctl
