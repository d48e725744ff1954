#include "platform/simulated/SimulatedBundles.h"

#include <utility>

namespace kelvo {
namespace {

constexpr std::string_view kLocalizationSuffix = ".lproj";

class SimulatedBundle : public Bundle {
  public:
    SimulatedBundle(std::string path, SimulatedBundleContent content)
        : path_(std::move(path)), content_(std::move(content)) {}

    std::string path() const override { return path_; }
    std::string resourcePath() const override { return path_; }
    std::string bundleIdentifier() const override { return content_.bundleIdentifier; }
    std::optional<std::string> name() const override { return content_.name; }
    std::optional<std::string> displayName() const override { return content_.displayName; }
    std::optional<std::string> localizedDisplayName() const override { return content_.localizedDisplayName; }
    std::optional<std::string> iconPath() const override { return content_.iconPath; }
    Dictionary entitlements() const override { return content_.entitlements; }

    std::vector<std::string> localizations() const override {
        std::vector<std::string> names;
        for (const auto& [localization, tables] : content_.tables) {
            if (!localization.empty()) names.push_back(localization);
        }
        return names;
    }

    std::optional<std::string> pathForResource(std::string_view name, std::string_view type,
                                               std::string_view localization) const override {
        const auto entry = content_.tables.find(std::string(localization));
        if (type != "strings" || entry == content_.tables.end()) return std::nullopt;
        if (!entry->second.contains(std::string(name))) return std::nullopt;
        std::string path = path_;
        path.append("/")
            .append(localization)
            .append(kLocalizationSuffix)
            .append("/")
            .append(name)
            .append(".strings");
        return path;
    }

    std::optional<std::string> localizedString(std::string_view key, std::string_view table) const override {
        const auto own = content_.tables.find("");
        const auto tables =
            own != content_.tables.end() ? own : content_.tables.find(content_.developmentLanguage);
        if (tables == content_.tables.end()) return std::nullopt;
        const auto entries = tables->second.find(std::string(table));
        if (entries == tables->second.end()) return std::nullopt;
        const auto text = entries->second.find(std::string(key));
        if (text == entries->second.end() || text->second.empty()) return std::nullopt;
        return text->second;
    }

  private:
    std::string path_;
    SimulatedBundleContent content_;
};

}  // namespace

void SimulatedBundles::addBundle(const std::string& path, SimulatedBundleContent content) {
    world_.with([&](World& world) {
        for (const auto& [localization, tables] : content.tables) {
            if (localization.empty()) continue;
            SimulatedBundleContent folder;
            folder.tables[""] = tables;
            std::string place = path;
            place.append("/").append(localization).append(kLocalizationSuffix);
            world.bundles[place] = std::move(folder);
        }
        world.bundles[path] = std::move(content);
    });
}

void SimulatedBundles::removeBundle(const std::string& path) {
    world_.with([&](World& world) {
        std::erase_if(world.bundles, [&](const auto& entry) {
            return entry.first == path || entry.first.starts_with(path + "/");
        });
    });
}

void SimulatedBundles::addProcess(std::int32_t processIdentifier, const std::string& executablePath) {
    world_.with([&](World& world) { world.processes[processIdentifier] = executablePath; });
}

void SimulatedBundles::removeProcess(std::int32_t processIdentifier) {
    world_.with([&](World& world) { world.processes.erase(processIdentifier); });
}

BundleRef SimulatedBundles::bundleAtPath(std::string_view path) {
    return world_.with([&](World& world) -> BundleRef {
        ++world.openCounts[std::string(path)];
        const auto entry = world.bundles.find(std::string(path));
        if (entry == world.bundles.end()) return nullptr;
        return std::make_shared<SimulatedBundle>(entry->first, entry->second);
    });
}

BundleRef SimulatedBundles::bundleWithIdentifier(std::string_view bundleIdentifier) {
    if (bundleIdentifier.empty()) return nullptr;  // a localization's folder has none
    return world_.with([&](World& world) -> BundleRef {
        for (const auto& [path, content] : world.bundles) {
            if (content.bundleIdentifier == bundleIdentifier)
                return std::make_shared<SimulatedBundle>(path, content);
        }
        return nullptr;
    });
}

std::optional<std::string> SimulatedBundles::executablePath(std::int32_t processIdentifier) {
    return world_.with([&](World& world) -> std::optional<std::string> {
        const auto entry = world.processes.find(processIdentifier);
        if (entry == world.processes.end()) return std::nullopt;
        return entry->second;
    });
}

std::optional<std::string> SimulatedBundles::folderOfBundleOwning(std::string_view executablePath) {
    return world_.with([&](World& world) -> std::optional<std::string> {
        std::string folder(executablePath);
        while (!folder.empty()) {
            folder.resize(folder.find_last_of('/') == std::string::npos ? 0 : folder.find_last_of('/'));
            if (world.bundles.contains(folder)) return folder;
        }
        return std::nullopt;
    });
}

int SimulatedBundles::openCount(const std::string& path) const {
    return world_.with([&](const World& world) {
        const auto entry = world.openCounts.find(path);
        return entry == world.openCounts.end() ? 0 : entry->second;
    });
}

}  // namespace kelvo
