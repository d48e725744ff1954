#include "base/Value.h"

#include <algorithm>

namespace kelvo {

Dictionary::Dictionary() = default;
Dictionary::Dictionary(const Dictionary&) = default;
Dictionary::Dictionary(Dictionary&&) noexcept = default;
Dictionary& Dictionary::operator=(const Dictionary&) = default;
Dictionary& Dictionary::operator=(Dictionary&&) noexcept = default;
Dictionary::~Dictionary() = default;

Dictionary::Dictionary(std::initializer_list<Entry> entries) {
    for (const Entry& entry : entries)
        set(entry.first, entry.second);
}

const Value* Dictionary::find(std::string_view key) const {
    const auto entry =
        std::find_if(entries_.begin(), entries_.end(), [key](const Entry& e) { return e.first == key; });
    return entry == entries_.end() ? nullptr : &entry->second;
}

void Dictionary::set(std::string_view key, Value value) {
    const auto entry =
        std::find_if(entries_.begin(), entries_.end(), [key](const Entry& e) { return e.first == key; });
    if (entry != entries_.end()) {
        entry->second = std::move(value);
    } else {
        entries_.emplace_back(std::string(key), std::move(value));
    }
}

bool Dictionary::remove(std::string_view key) {
    return std::erase_if(entries_, [key](const Entry& e) { return e.first == key; }) > 0;
}

void Dictionary::merge(const Dictionary& other) {
    for (const auto& [key, value] : other)
        set(key, value);
}

std::size_t Dictionary::size() const {
    return entries_.size();
}
std::vector<Dictionary::Entry>::const_iterator Dictionary::begin() const {
    return entries_.begin();
}
std::vector<Dictionary::Entry>::const_iterator Dictionary::end() const {
    return entries_.end();
}

bool operator==(const Dictionary& left, const Dictionary& right) {
    return left.entries_ == right.entries_;
}

}  // namespace kelvo
