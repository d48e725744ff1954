#pragma once

#include "platform/Bundles.h"
#include "platform/linux/bundles/DesktopEntries.h"

namespace kelvo {

/// An application of the desktop as a bundle: its names and icon, no texts, and no rights. Immutable;
/// thread-safe.
class DesktopBundle : public Bundle {
  public:
    /// `devicePath` and `deviceIcon` are the entry's file and its icon's as the device knows them.
    DesktopBundle(DesktopApplicationEntryRef entry, std::string devicePath,
                  std::optional<std::string> deviceIcon, std::shared_ptr<Languages> languages)
        : entry_(std::move(entry)),
          path_(std::move(devicePath)),
          icon_(std::move(deviceIcon)),
          languages_(std::move(languages)) {}

    std::string path() const override { return path_; }
    std::string resourcePath() const override { return path_.substr(0, path_.rfind('/')); }
    std::string bundleIdentifier() const override { return entry_->identifier; }
    std::optional<std::string> name() const override { return entry_->file.name; }
    std::optional<std::string> displayName() const override { return entry_->file.name; }
    std::optional<std::string> localizedDisplayName() const override;
    std::optional<std::string> iconPath() const override { return icon_; }
    std::vector<std::string> localizations() const override { return {}; }
    std::optional<std::string> pathForResource(std::string_view, std::string_view,
                                               std::string_view) const override {
        return std::nullopt;
    }
    std::optional<std::string> localizedString(std::string_view, std::string_view) const override {
        return std::nullopt;
    }
    Dictionary entitlements() const override { return {}; }

  private:
    const DesktopApplicationEntryRef entry_;
    const std::string path_;
    const std::optional<std::string> icon_;
    const std::shared_ptr<Languages> languages_;
};

}  // namespace kelvo
