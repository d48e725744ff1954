#include "platform/Bundles.h"

#include <algorithm>

namespace kelvo {

std::vector<std::string> preferredLocalizations(const std::vector<std::string>& localizations,
                                                const std::vector<std::string>& preferredLanguages) {
    const auto has = [](const std::vector<std::string>& list, std::string_view tag) {
        return std::find(list.begin(), list.end(), tag) != list.end();
    };
    std::vector<std::string> chosen;
    for (std::string tag : preferredLanguages) {
        while (!tag.empty() && !has(localizations, tag)) {
            const std::size_t cut = tag.rfind('-');
            tag.resize(cut == std::string::npos ? 0 : cut);
        }
        if (!tag.empty() && !has(chosen, tag)) chosen.push_back(tag);
    }
    if (chosen.empty() && !localizations.empty()) {
        chosen.push_back(has(localizations, "en") ? "en" : localizations.front());
    }
    return chosen;
}

}  // namespace kelvo
