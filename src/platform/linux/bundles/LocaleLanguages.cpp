#include "platform/linux/bundles/LocaleLanguages.h"

#include <algorithm>
#include <cctype>
#include <cstdlib>

namespace kelvo {
namespace {

std::string environmentText(const char* name) {
    const char* text = std::getenv(name);  // NOLINT(concurrency-mt-unsafe): read once, before threads start
    return text != nullptr ? text : "";
}

std::string decidingLocale() {
    for (const char* name : {"LC_ALL", "LC_MESSAGES", "LANG"}) {
        if (std::string locale = environmentText(name); !locale.empty()) return locale;
    }
    return {};
}

/// The script in which a Chinese-speaking region writes.
std::string_view chineseScript(std::string_view region) {
    return region == "TW" || region == "HK" || region == "MO" ? "Hant" : "Hans";
}

}  // namespace

std::string languageTag(std::string_view localeName) {
    std::string tag(localeName.substr(0, localeName.find_first_of(".@")));
    std::replace(tag.begin(), tag.end(), '_', '-');
    const auto isTagCharacter = [](unsigned char c) { return std::isalnum(c) != 0 || c == '-'; };
    if (tag == "C" || tag == "POSIX" || !std::all_of(tag.begin(), tag.end(), isTagCharacter)) return {};
    const std::string_view rest = std::string_view(tag).substr(std::min<std::size_t>(tag.size(), 3));
    const bool namesScript = rest.starts_with("Han");
    if ((tag == "zh" || tag.starts_with("zh-")) && !namesScript) {
        const std::string region(rest);
        tag = "zh-" + std::string(chineseScript(region));
        if (!region.empty()) tag += "-" + region;
    }
    return tag;
}

LocaleLanguages::LocaleLanguages() : LocaleLanguages(environmentText("LANGUAGE"), decidingLocale()) {}

LocaleLanguages::LocaleLanguages(std::string_view languageList, std::string_view locale) {
    std::string_view rest = languageList;
    while (!rest.empty()) {
        const std::size_t end = std::min(rest.find(':'), rest.size());
        if (std::string tag = languageTag(rest.substr(0, end)); !tag.empty())
            languages_.push_back(std::move(tag));
        rest.remove_prefix(std::min(end + 1, rest.size()));
    }
    if (std::string tag = languageTag(locale); languages_.empty() && !tag.empty())
        languages_.push_back(std::move(tag));
    if (languages_.empty()) languages_.push_back("en");
}

std::optional<std::string> nameForUser(const Dictionary& names, Languages& languages) {
    std::vector<std::string> tags;
    for (const auto& [tag, name] : names)
        tags.push_back(tag);
    const auto chosen = preferredLocalizations(tags, languages.preferredLanguages());
    if (chosen.empty()) return std::nullopt;
    const std::string* const name = names.find(chosen.front())->asString();
    return name != nullptr ? std::optional(*name) : std::nullopt;
}

}  // namespace kelvo
