#pragma once

#include "base/Value.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kelvo {

/// A folder with an `Info.json`: an application, a framework, an extension or a module of the system shell.
/// Or an application that a desktop knows by a file of its own, which then stands for the folder.
/// Immutable once opened but for its string tables, which are read when they are asked for; thread-safe.
class Bundle {
  public:
    virtual ~Bundle() = default;

    /// The folder, as a path of the device.
    virtual std::string path() const = 0;
    /// The folder of the bundle's resources.
    virtual std::string resourcePath() const = 0;

    /// Empty when the bundle names none.
    virtual std::string bundleIdentifier() const = 0;

    /// The plain name and display name, and the display name in the user's language.
    virtual std::optional<std::string> name() const = 0;
    virtual std::optional<std::string> displayName() const = 0;
    virtual std::optional<std::string> localizedDisplayName() const = 0;

    /// The path of the bundle's icon, an image file; none when it has none.
    virtual std::optional<std::string> iconPath() const = 0;

    /// The names of the bundle's `*.lproj` folders ("en", "zh-Hans"), in alphabetical order.
    virtual std::vector<std::string> localizations() const = 0;

    /// The path of `name`.`type` in the folder of one localization; none when it is not there.
    virtual std::optional<std::string> pathForResource(std::string_view name, std::string_view type,
                                                       std::string_view localization) const = 0;

    /// The text under `key` in string table `table` of this folder or, when the folder has no such table, of
    /// the bundle's development language. None when the key is missing or its text is empty.
    virtual std::optional<std::string> localizedString(std::string_view key,
                                                       std::string_view table) const = 0;

    /// The rights that the bundle claims. Empty unless only root or the daemon's own user can change the
    /// bundle.
    virtual Dictionary entitlements() const = 0;
};

using BundleRef = std::shared_ptr<const Bundle>;

/// Finds bundles and processes. Implemented by the Linux adapter (`Info.json` folders, /proc) and the
/// simulated device. Any thread. What cannot be found is none; nothing fails louder than that.
class BundleService {
  public:
    virtual ~BundleService() = default;

    /// The bundle in the folder at `path`. A localization's folder opens as a bundle of its own, without an
    /// `Info.json`; none when there is no such folder.
    virtual BundleRef bundleAtPath(std::string_view path) = 0;

    virtual BundleRef bundleWithIdentifier(std::string_view bundleIdentifier) = 0;

    /// The path of the program that a process runs, at most 4095 bytes of UTF-8; none when the process is
    /// gone.
    virtual std::optional<std::string> executablePath(std::int32_t processIdentifier) = 0;

    /// The folder of the bundle that holds the program at `executablePath`.
    virtual std::optional<std::string> folderOfBundleOwning(std::string_view executablePath) = 0;
};

/// The user's languages. Implemented by the locale's environment and the simulated device. Any thread.
class Languages {
  public:
    virtual ~Languages() = default;

    /// Language tags such as "pt-BR", best first; at least one.
    virtual std::vector<std::string> preferredLanguages() = 0;
};

/// Those of a bundle's `localizations` that serve a user of `preferredLanguages`, best first: for each
/// language the exact tag, then the tag shortened from its end ("zh-Hans-CN" finds "zh-Hans"). When nothing
/// serves the user, English if it is there, else the first localization. Empty only without localizations.
std::vector<std::string> preferredLocalizations(const std::vector<std::string>& localizations,
                                                const std::vector<std::string>& preferredLanguages);

}  // namespace kelvo
