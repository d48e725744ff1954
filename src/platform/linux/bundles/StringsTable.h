#pragma once

#include "base/Result.h"

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kelvo {

/// A table of localized texts, read from the lines of a `.strings` file:
///
///     /* comment */  // comment
///     "KEY" = "text with \"quotes\", \n and \U00E9";
///
/// UTF-8, with or without a byte-order mark. Holds the file's text, unescaped in place, and 16 bytes an
/// entry: never more than four times the file. Immutable; thread-safe.
class StringsTable {
  public:
    /// The largest file that is read.
    static constexpr std::size_t kMostBytes = 4U << 20;

    /// Fails, naming the line, on anything but entries and comments, on text that is not UTF-8, on an empty
    /// key and on a key that stands twice.
    static Result<StringsTable> parse(std::string text);

    std::optional<std::string_view> find(std::string_view key) const;

    std::size_t size() const { return entries_.size(); }
    /// In alphabetical order.
    std::vector<std::string_view> keys() const;

  private:
    friend class StringsParser;
    struct Entry {
        std::uint32_t keyStart, keyLength, textStart, textLength;
    };

    std::string_view keyOf(const Entry& entry) const;

    std::string text_;
    std::vector<Entry> entries_;  // by key
};

}  // namespace kelvo
