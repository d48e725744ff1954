#include "platform/linux/bundles/StringsTable.h"

#include "platform/linux/bundles/StringsParser.h"

#include <algorithm>

namespace kelvo {

Result<StringsTable> StringsTable::parse(std::string text) {
    StringsTable table;
    table.text_ = std::move(text);
    if (const OptionalError error = StringsParser(table).run()) return *error;
    return table;
}

std::string_view StringsTable::keyOf(const Entry& entry) const {
    return std::string_view(text_).substr(entry.keyStart, entry.keyLength);
}

std::optional<std::string_view> StringsTable::find(std::string_view key) const {
    const auto entry =
        std::lower_bound(entries_.begin(), entries_.end(), key,
                         [this](const Entry& e, std::string_view wanted) { return keyOf(e) < wanted; });
    if (entry == entries_.end() || keyOf(*entry) != key) return std::nullopt;
    return std::string_view(text_).substr(entry->textStart, entry->textLength);
}

std::vector<std::string_view> StringsTable::keys() const {
    std::vector<std::string_view> keys;
    keys.reserve(entries_.size());
    for (const Entry& entry : entries_)
        keys.push_back(keyOf(entry));
    return keys;
}

}  // namespace kelvo
