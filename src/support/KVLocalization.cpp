#include "support/KVLocalization.h"

#include <utility>

namespace kelvo {
namespace {

constexpr std::string_view kFrameworkPath = "/System/Library/Frameworks/KelvoKit.framework";
constexpr std::string_view kTable = "Localizable";
constexpr std::string_view kTableType = "strings";

std::string parentDirectory(const std::string& path) {
    return path.substr(0, path.rfind('/'));
}

}  // namespace

KVLocalization::KVLocalization(std::shared_ptr<BundleService> bundles, std::shared_ptr<Languages> languages)
    : bundles_(std::move(bundles)), languages_(std::move(languages)) {}

BundleRef KVLocalization::kvFrameworkBundle() {
    std::call_once(frameworkOpened_, [this] { framework_ = bundles_->bundleAtPath(kFrameworkPath); });
    return framework_;
}

std::optional<std::string> KVLocalization::kvLocalizedStringFromFrameworkBundleWithKey(std::string_view key) {
    using Try = BundleRef (KVLocalization::*)();
    for (const Try source : {&KVLocalization::localizedBundle, &KVLocalization::fallbackBundle,
                             &KVLocalization::kvFrameworkBundle}) {
        const BundleRef bundle = (this->*source)();
        if (!bundle) continue;
        if (auto text = bundle->localizedString(key, kTable); text && !text->empty()) return text;
    }
    return std::nullopt;
}

BundleRef KVLocalization::localizedBundle() {
    const BundleRef framework = kvFrameworkBundle();
    if (!framework) return nullptr;
    const auto preferred =
        preferredLocalizations(framework->localizations(), languages_->preferredLanguages());
    if (preferred.empty()) return nullptr;
    return bundles_->bundleAtPath(framework->resourcePath() + "/" + preferred.front() + ".lproj");
}

BundleRef KVLocalization::fallbackBundle() {
    const BundleRef framework = kvFrameworkBundle();
    const auto languages = languages_->preferredLanguages();
    if (!framework || languages.empty()) return nullptr;
    const std::string base = languages.front().substr(0, languages.front().find('-'));
    const auto table = framework->pathForResource(kTable, kTableType, base);
    if (!table) return nullptr;
    return bundles_->bundleAtPath(parentDirectory(*table));
}

std::string KVLocalization::kvLocalizedAppName(const Bundle& bundle) {
    if (const auto name = bundle.localizedDisplayName()) return *name;
    if (const auto name = bundle.displayName()) return *name;
    return bundle.name().value_or("");
}

std::optional<std::string> KVLocalization::kvLocalizedAppNameFromBundleID(std::string_view bundleIdentifier) {
    const BundleRef bundle = bundles_->bundleWithIdentifier(bundleIdentifier);
    if (!bundle) return std::nullopt;
    return kvLocalizedAppName(*bundle);
}

std::string KVLocalization::baseIdentifier(std::string_view bundleIdentifier) {
    const std::size_t lastDot = bundleIdentifier.rfind('.');
    return std::string(bundleIdentifier.substr(0, lastDot == std::string_view::npos ? 0 : lastDot));
}

BundleRef KVLocalization::bundleWithPID(std::int32_t processIdentifier) {
    const auto executable = bundles_->executablePath(processIdentifier);
    if (!executable) return nullptr;
    const auto folder = bundles_->folderOfBundleOwning(*executable);
    if (!folder) return nullptr;
    return bundles_->bundleAtPath(*folder);
}

}  // namespace kelvo
