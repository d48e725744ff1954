#pragma once

#include "platform/Bundles.h"
#include "platform/linux/bundles/DesktopEntries.h"
#include "platform/linux/files/DeviceRoot.h"

#include <memory>

namespace kelvo {

/// Bundles as folders with an `Info.json`, under the device root and in the installed resources; processes
/// from /proc. Applications are looked for in "/Applications", "/System/Applications",
/// "/System/Library/Frameworks" and "/System/Library/QuickPanel/Bundles", in this order, then in the
/// installed resources, and then among the desktop entries of `desktop` (by default none), whose applications
/// have names and icons but no rights. Thread-safe.
class LinuxBundleService : public BundleService {
  public:
    LinuxBundleService(std::shared_ptr<const DeviceRoot> root, std::shared_ptr<Languages> languages,
                       DesktopFolders desktop = {})
        : root_(std::move(root)), languages_(std::move(languages)), desktop_(std::move(desktop)) {}

    BundleRef bundleAtPath(std::string_view path) override;
    BundleRef bundleWithIdentifier(std::string_view bundleIdentifier) override;

    /// None, too, when the path does not lead this process to the very file that runs: a program that was
    /// replaced or deleted, or one that another mount namespace makes look like somebody else's.
    std::optional<std::string> executablePath(std::int32_t processIdentifier) override;

    /// The nearest folder above the program that has an `Info.json`, else the desktop entry that starts it.
    std::optional<std::string> folderOfBundleOwning(std::string_view executablePath) override;

  private:
    BundleRef bundleInFolder(const std::string& hostFolder, std::string_view bundleIdentifier) const;

    BundleRef bundleOfEntry(const DesktopApplicationEntryRef& entry) const;

    std::shared_ptr<const DeviceRoot> root_;
    std::shared_ptr<Languages> languages_;
    DesktopEntries desktop_;
};

}  // namespace kelvo
