#pragma once

#include "base/Guarded.h"
#include "platform/Bundles.h"

#include <map>

namespace kelvo {

/// What a test says about one bundle.
struct SimulatedBundleContent {
    std::string bundleIdentifier;
    std::optional<std::string> name;
    std::optional<std::string> displayName;
    std::optional<std::string> localizedDisplayName;
    std::optional<std::string> iconPath;
    Dictionary entitlements;
    std::string developmentLanguage = "en";
    /// String tables by localization, table and key. The localization "" is a bundle of one localization's
    /// folder.
    std::map<std::string, std::map<std::string, std::map<std::string, std::string>>> tables;
};

/// Bundles and processes as a test lists them. Thread-safe.
class SimulatedBundles : public BundleService {
  public:
    /// Puts a bundle at `path`; each localization with tables gets its folder "<path>/<localization>.lproj".
    void addBundle(const std::string& path, SimulatedBundleContent content);
    void removeBundle(const std::string& path);

    /// A process with this identifier runs the program at `executablePath`.
    void addProcess(std::int32_t processIdentifier, const std::string& executablePath);
    void removeProcess(std::int32_t processIdentifier);

    BundleRef bundleAtPath(std::string_view path) override;
    BundleRef bundleWithIdentifier(std::string_view bundleIdentifier) override;
    std::optional<std::string> executablePath(std::int32_t processIdentifier) override;
    std::optional<std::string> folderOfBundleOwning(std::string_view executablePath) override;

    /// How often a bundle was opened at exactly this path.
    int openCount(const std::string& path) const;

  private:
    struct World {
        std::map<std::string, SimulatedBundleContent> bundles;
        std::map<std::int32_t, std::string> processes;
        std::map<std::string, int> openCounts;
    };
    Guarded<World> world_;
};

/// Preferred languages as a test sets them; at first English. Thread-safe.
class SimulatedLanguages : public Languages {
  public:
    std::vector<std::string> preferredLanguages() override { return languages_.copy(); }
    void setPreferredLanguages(std::vector<std::string> languages) { languages_.set(std::move(languages)); }

  private:
    Guarded<std::vector<std::string>> languages_{std::vector<std::string>{"en"}};
};

}  // namespace kelvo
