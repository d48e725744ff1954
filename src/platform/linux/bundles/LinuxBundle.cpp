#include "platform/linux/bundles/LinuxBundle.h"

#include "base/KVLog.h"
#include "platform/linux/bundles/LocaleLanguages.h"
#include "platform/linux/bundles/StringsTable.h"
#include "platform/linux/files/ReadFile.h"

#include <algorithm>
#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>

namespace kelvo {
namespace {

namespace fs = std::filesystem;

constexpr std::string_view kLocalizationSuffix = ".lproj";

std::string tableFile(const std::string& folder, std::string_view table) {
    return folder + "/" + std::string(table) + ".strings";
}

/// Whether only root and this process's user can change what is at `hostPath`.
bool isOursAlone(const std::string& hostPath) {
    struct stat status {};
    if (::lstat(hostPath.c_str(), &status) != 0) return false;
    const bool isOurs = status.st_uid == 0 || status.st_uid == ::geteuid();
    return isOurs && !S_ISLNK(status.st_mode) && (status.st_mode & (S_IWGRP | S_IWOTH)) == 0;
}

}  // namespace

BundleRef LinuxBundle::open(std::string hostFolder, std::string devicePath,
                            std::shared_ptr<Languages> languages) {
    std::error_code ignored;
    if (!fs::is_directory(hostFolder, ignored)) return nullptr;
    BundleInfo info;
    const std::string infoFile = hostFolder + "/" + std::string(kInfoFileName);
    if (fs::exists(infoFile, ignored)) {
        const auto json = readFile(infoFile, BundleInfo::kMostBytes);
        auto parsed = json ? BundleInfo::parse(*json) : Result<BundleInfo>(json.error());
        if (!parsed) {
            KVLogError("cannot read %s: %s", infoFile.c_str(), parsed.error().localizedDescription().c_str());
            return nullptr;
        }
        info = std::move(*parsed);
    }
    return std::make_shared<LinuxBundle>(std::move(hostFolder), std::move(devicePath), std::move(info),
                                         std::move(languages));
}

LinuxBundle::LinuxBundle(std::string hostFolder, std::string devicePath, BundleInfo info,
                         std::shared_ptr<Languages> languages)
    : hostFolder_(std::move(hostFolder)),
      devicePath_(std::move(devicePath)),
      info_(std::move(info)),
      languages_(std::move(languages)) {}

std::optional<std::string> LinuxBundle::localizedDisplayName() const {
    return nameForUser(info_.localizedNames, *languages_);
}

std::optional<std::string> LinuxBundle::iconPath() const {
    const fs::path icon = fs::path(info_.icon).lexically_normal();
    std::error_code ignored;
    const bool isInside = !icon.empty() && icon.is_relative() && *icon.begin() != "..";
    if (!isInside || !fs::is_regular_file(hostFolder_ / icon, ignored)) return std::nullopt;
    return devicePath_ + "/" + icon.string();
}

std::vector<std::string> LinuxBundle::localizations() const {
    std::vector<std::string> names;
    std::error_code code;
    for (fs::directory_iterator entry(hostFolder_, code), end; !code && entry != end; entry.increment(code)) {
        const fs::path path = entry->path();
        if (path.extension() == kLocalizationSuffix) names.push_back(path.stem().string());
    }
    std::sort(names.begin(), names.end());
    return names;
}

std::optional<std::string> LinuxBundle::pathForResource(std::string_view name, std::string_view type,
                                                        std::string_view localization) const {
    std::string relative = "/";
    if (!localization.empty()) relative.append(localization).append(kLocalizationSuffix).append("/");
    relative.append(name).append(".").append(type);
    std::error_code ignored;
    if (!fs::is_regular_file(hostFolder_ + relative, ignored)) return std::nullopt;
    return devicePath_ + relative;
}

std::optional<std::string> LinuxBundle::localizedString(std::string_view key, std::string_view table) const {
    const std::string own = tableFile(hostFolder_, table);
    std::error_code ignored;
    if (fs::exists(own, ignored)) return textIn(own, key);
    const std::string developed =
        hostFolder_ + "/" + info_.developmentLanguage + std::string(kLocalizationSuffix);
    return fs::exists(tableFile(developed, table), ignored) ? textIn(tableFile(developed, table), key)
                                                            : std::nullopt;
}

std::optional<std::string> LinuxBundle::textIn(const std::string& file, std::string_view key) const {
    auto content = readFile(file, StringsTable::kMostBytes);
    const auto table =
        content ? StringsTable::parse(std::move(*content)) : Result<StringsTable>(content.error());
    if (!table) {
        KVLogError("cannot read %s: %s", file.c_str(), table.error().localizedDescription().c_str());
        return std::nullopt;
    }
    const auto text = table->find(key);
    return text && !text->empty() ? std::optional(std::string(*text)) : std::nullopt;
}

Dictionary LinuxBundle::entitlements() const {
    return isTrusted() ? info_.entitlements : Dictionary();
}

bool LinuxBundle::isTrusted() const {
    return !info_.executable.empty() && isOursAlone(hostFolder_) &&
           isOursAlone(hostFolder_ + "/" + info_.executable) &&
           isOursAlone(hostFolder_ + "/" + std::string(kInfoFileName));
}

}  // namespace kelvo
