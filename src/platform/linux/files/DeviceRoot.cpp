#include "platform/linux/files/DeviceRoot.h"

#include <filesystem>

namespace kelvo {
namespace {

namespace fs = std::filesystem;

constexpr std::string_view kHostPrefix = "/@host/";
constexpr std::string_view kSystemPrefix = "/System/";

std::string withoutTrailingSlash(std::string_view path) {
    std::string text = fs::path(path).lexically_normal().string();
    while (text.ends_with('/'))
        text.pop_back();
    return text;
}

/// The part of a system path that the resource folder holds: from the component that is a bundle on.
std::string resourcePart(const fs::path& systemPath) {
    fs::path part;
    for (const fs::path& component : systemPath) {
        const std::string extension = component.extension().string();
        if (!part.empty() || extension == ".framework" || extension == ".bundle") part /= component;
    }
    return part.string();
}

}  // namespace

DeviceRoot::DeviceRoot(std::string_view root, std::string_view resourceFolder)
    : root_(withoutTrailingSlash(root)), resourceFolder_(withoutTrailingSlash(resourceFolder)) {}

std::string DeviceRoot::hostPath(std::string_view devicePath) const {
    // An absolute path in normal form has no ".." left: those above the root are dropped.
    const std::string normal = ("/" / fs::path(devicePath)).lexically_normal().string();
    if (normal.starts_with(kHostPrefix)) return normal.substr(kHostPrefix.size() - 1);
    return root_ + normal;
}

std::string DeviceRoot::hostPathForReading(std::string_view devicePath) const {
    std::string own = hostPath(devicePath);
    std::error_code ignored;
    if (!devicePath.starts_with(kSystemPrefix) || fs::exists(own, ignored)) return own;
    const std::string part = resourcePart(fs::path(devicePath).lexically_normal());
    return part.empty() ? own : resourceFolder_ + "/" + part;
}

std::string DeviceRoot::devicePath(std::string_view hostPath) const {
    std::string normal = fs::path(hostPath).lexically_normal().string();
    if (root_.empty()) return normal;
    if (normal.starts_with(root_ + "/")) return normal.substr(root_.size());
    return std::string(kHostPrefix.substr(0, kHostPrefix.size() - 1)) + normal;
}

}  // namespace kelvo
