#include "platform/linux/bundles/LinuxBundleService.h"

#include "platform/linux/bundles/DesktopBundle.h"
#include "platform/linux/bundles/LinuxBundle.h"

#include <array>
#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>
#include <utf8proc.h>

namespace kelvo {
namespace {

namespace fs = std::filesystem;

constexpr std::string_view kDesktopSuffix = ".desktop";
constexpr std::size_t kLongestPath = 4096;
constexpr std::array<std::string_view, 4> kBundleFolders{"/Applications", "/System/Applications",
                                                         "/System/Library/Frameworks",
                                                         "/System/Library/QuickPanel/Bundles"};

bool isUtf8(std::string_view text) {
    const auto* bytes = reinterpret_cast<const utf8proc_uint8_t*>(text.data());
    for (std::size_t i = 0; i < text.size();) {
        utf8proc_int32_t ignored = 0;
        const auto length =
            utf8proc_iterate(bytes + i, static_cast<utf8proc_ssize_t>(text.size() - i), &ignored);
        if (length <= 0) return false;
        i += static_cast<std::size_t>(length);
    }
    return true;
}

bool isSameFile(const std::string& left, const std::string& right) {
    struct stat one {};
    struct stat other {};
    return ::stat(left.c_str(), &one) == 0 && ::stat(right.c_str(), &other) == 0 &&
           one.st_dev == other.st_dev && one.st_ino == other.st_ino;
}

}  // namespace

BundleRef LinuxBundleService::bundleAtPath(std::string_view path) {
    if (path.ends_with(kDesktopSuffix)) {
        if (const auto entry = desktop_.inFile(root_->hostPath(path))) return bundleOfEntry(entry);
    }
    return LinuxBundle::open(root_->hostPathForReading(path), std::string(path), languages_);
}

BundleRef LinuxBundleService::bundleWithIdentifier(std::string_view bundleIdentifier) {
    if (bundleIdentifier.empty()) return nullptr;
    for (const std::string_view folder : kBundleFolders) {
        if (BundleRef bundle = bundleInFolder(root_->hostPath(folder), bundleIdentifier)) return bundle;
    }
    if (BundleRef bundle = bundleInFolder(root_->resourceFolder(), bundleIdentifier)) return bundle;
    const auto entry = desktop_.withIdentifier(bundleIdentifier);
    return entry ? bundleOfEntry(entry) : nullptr;
}

BundleRef LinuxBundleService::bundleOfEntry(const DesktopApplicationEntryRef& entry) const {
    const std::string icon = iconFile(desktop_.folders(), entry->file.icon);
    return std::make_shared<DesktopBundle>(
        entry, root_->devicePath(entry->hostFile),
        icon.empty() ? std::nullopt : std::optional(root_->devicePath(icon)), languages_);
}

BundleRef LinuxBundleService::bundleInFolder(const std::string& hostFolder,
                                             std::string_view bundleIdentifier) const {
    std::error_code code;
    for (fs::directory_iterator entry(hostFolder, code), end; !code && entry != end; entry.increment(code)) {
        std::error_code ignored;
        const std::string folder = entry->path().string();
        if (!fs::exists(folder + "/" + std::string(kInfoFileName), ignored)) continue;
        BundleRef bundle = LinuxBundle::open(folder, root_->devicePath(folder), languages_);
        if (bundle && bundle->bundleIdentifier() == bundleIdentifier) return bundle;
    }
    return nullptr;
}

std::optional<std::string> LinuxBundleService::executablePath(std::int32_t processIdentifier) {
    const std::string link = "/proc/" + std::to_string(processIdentifier) + "/exe";
    std::array<char, kLongestPath> buffer;
    const ssize_t length = ::readlink(link.c_str(), buffer.data(), buffer.size());
    if (length <= 0 || static_cast<std::size_t>(length) >= buffer.size()) return std::nullopt;
    std::string path(buffer.data(), static_cast<std::size_t>(length));
    if (!isUtf8(path) || !isSameFile(link, path)) return std::nullopt;
    return path;
}

std::optional<std::string> LinuxBundleService::folderOfBundleOwning(std::string_view executablePath) {
    std::error_code ignored;
    fs::path folder = fs::path(executablePath).lexically_normal().parent_path();
    while (folder.has_relative_path()) {
        if (fs::exists(folder / kInfoFileName, ignored)) return root_->devicePath(folder.string());
        folder = folder.parent_path();
    }
    const auto entry = desktop_.ofProgram(executablePath);
    return entry ? std::optional(root_->devicePath(entry->hostFile)) : std::nullopt;
}

}  // namespace kelvo
