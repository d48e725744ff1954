#pragma once

#include "platform/linux/bundles/StringsTable.h"

namespace kelvo {

/// Turns a table's raw text into its entries. Text is unescaped where it stands: what an escape stands for is
/// never longer than the escape.
class StringsParser {
  public:
    explicit StringsParser(StringsTable& table) : table_(table), text_(table.text_) {}

    OptionalError run();

  private:
    struct Range {
        std::uint32_t start = 0;
        std::uint32_t length = 0;
    };

    OptionalError checkEncoding() const;
    OptionalError parseEntry();
    OptionalError skipBlanks();
    OptionalError skipComment();
    OptionalError expect(char character);
    Result<Range> parseQuoted();
    OptionalError unescape(std::size_t& out);
    OptionalError unescapeCodePoint(std::size_t& out);
    OptionalError sortEntries();
    bool atEnd() const { return position_ >= text_.size(); }
    KVError malformed(const std::string& reason) const;

    StringsTable& table_;
    std::string& text_;
    std::size_t position_ = 0;
    std::size_t line_ = 1;
};

}  // namespace kelvo
