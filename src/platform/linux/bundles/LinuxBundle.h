#pragma once

#include "platform/Bundles.h"
#include "platform/linux/bundles/BundleInfo.h"

#include <memory>

namespace kelvo {

/// A bundle's folder on the host. Immutable; thread-safe. String tables are read at each look-up.
class LinuxBundle : public Bundle {
  public:
    /// The bundle in `hostFolder`, which the device knows as `devicePath`. None when there is no such folder,
    /// and (with a line in the log) when its `Info.json` is malformed.
    static BundleRef open(std::string hostFolder, std::string devicePath,
                          std::shared_ptr<Languages> languages);

    LinuxBundle(std::string hostFolder, std::string devicePath, BundleInfo info,
                std::shared_ptr<Languages> languages);

    std::string path() const override { return devicePath_; }
    std::string resourcePath() const override { return devicePath_; }
    std::string bundleIdentifier() const override { return info_.identifier; }
    std::optional<std::string> name() const override { return info_.name; }
    std::optional<std::string> displayName() const override { return info_.displayName; }
    std::optional<std::string> localizedDisplayName() const override;
    std::optional<std::string> iconPath() const override;
    std::vector<std::string> localizations() const override;
    std::optional<std::string> pathForResource(std::string_view name, std::string_view type,
                                               std::string_view localization) const override;
    std::optional<std::string> localizedString(std::string_view key, std::string_view table) const override;
    Dictionary entitlements() const override;

  private:
    std::optional<std::string> textIn(const std::string& tableFile, std::string_view key) const;
    bool isTrusted() const;

    const std::string hostFolder_;
    const std::string devicePath_;
    const BundleInfo info_;
    const std::shared_ptr<Languages> languages_;
};

/// Name of the file that describes a bundle.
inline constexpr std::string_view kInfoFileName = "Info.json";

}  // namespace kelvo
