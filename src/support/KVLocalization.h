#pragma once

#include "platform/Bundles.h"

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

namespace kelvo {

/// Looks up the texts of the client framework, in the user's language, and the names and bundles of
/// applications. Thread-safe. What cannot be found is none.
class KVLocalization {
  public:
    KVLocalization(std::shared_ptr<BundleService> bundles, std::shared_ptr<Languages> languages);

    /// The client framework's bundle, opened once; none when it is not installed.
    BundleRef kvFrameworkBundle();

    /// The text under `key` of table "Localizable": from the best localization, else from the one of the
    /// first language's base code, else from the framework's development language.
    std::optional<std::string> kvLocalizedStringFromFrameworkBundleWithKey(std::string_view key);

    /// The framework's best localization for the user.
    BundleRef localizedBundle();

    /// The localization for the first preferred language without its region, when that has the table.
    BundleRef fallbackBundle();

    /// The name to show for a bundle; the empty string when it has none.
    static std::string kvLocalizedAppName(const Bundle& bundle);

    /// The same for the bundle with this identifier; none when there is no such bundle.
    std::optional<std::string> kvLocalizedAppNameFromBundleID(std::string_view bundleIdentifier);

    /// `bundleIdentifier` without its last dot-separated component; empty when it has no dot.
    static std::string baseIdentifier(std::string_view bundleIdentifier);

    /// The bundle that holds the program which a process runs.
    BundleRef bundleWithPID(std::int32_t processIdentifier);

  private:
    std::shared_ptr<BundleService> bundles_;
    std::shared_ptr<Languages> languages_;
    std::once_flag frameworkOpened_;
    BundleRef framework_;
};

}  // namespace kelvo
