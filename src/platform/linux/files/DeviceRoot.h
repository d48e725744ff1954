#pragma once

#include <string>
#include <string_view>

namespace kelvo {

/// Translates between the absolute paths that the logic knows and the host's. Immutable; thread-safe.
///
/// A device path lies under the device root: with the root "/srv/phone", "/etc/x" is the host's
/// "/srv/phone/etc/x".
/// ".." cannot leave the root. Host paths outside the root (a program in /usr/bin) have a device path too,
/// under
/// "/@host". System resources ("/System/…") that the root does not hold are found in the installed resource
/// folder, so a fresh root works at once.
class DeviceRoot {
  public:
    /// Both are host paths; `resourceFolder` holds the frameworks and bundles by their own names.
    DeviceRoot(std::string_view root, std::string_view resourceFolder);

    const std::string& root() const { return root_; }
    const std::string& resourceFolder() const { return resourceFolder_; }

    /// Where the item at a device path is, or would be created, on the host.
    std::string hostPath(std::string_view devicePath) const;

    /// The same for reading: falls back to the installed resources.
    std::string hostPathForReading(std::string_view devicePath) const;

    /// The device path of a host path.
    std::string devicePath(std::string_view hostPath) const;

  private:
    std::string root_;            // without a trailing slash: empty for "/"
    std::string resourceFolder_;  // likewise
};

}  // namespace kelvo
