#include "platform/linux/bundles/StringsParser.h"

#include "platform/linux/bundles/MalformedFile.h"

#include <algorithm>
#include <charconv>
#include <utf8proc.h>

namespace kelvo {
namespace {

constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";
/// The shortest entry there is: "a"="";
constexpr std::size_t kShortestEntry = 7;

const utf8proc_uint8_t* asBytes(const char* text) {
    return reinterpret_cast<const utf8proc_uint8_t*>(text);
}

}  // namespace

KVError StringsParser::malformed(const std::string& reason) const {
    return malformedFile(line_, reason);
}

OptionalError StringsParser::run() {
    if (text_.size() > StringsTable::kMostBytes) return malformedFile(0, "the table is too large");
    if (OptionalError error = checkEncoding()) return error;
    if (text_.starts_with(kByteOrderMark)) position_ = kByteOrderMark.size();
    // Room for every entry that there can be, so that growing never holds two copies of the entries.
    const auto semicolons = static_cast<std::size_t>(std::count(text_.begin(), text_.end(), ';'));
    table_.entries_.reserve(std::min(semicolons, text_.size() / kShortestEntry));
    while (true) {
        if (OptionalError error = skipBlanks()) return error;
        if (atEnd()) return sortEntries();
        if (OptionalError error = parseEntry()) return error;
    }
}

OptionalError StringsParser::checkEncoding() const {
    std::size_t line = 1;
    for (std::size_t i = 0; i < text_.size();) {
        utf8proc_int32_t codePoint = 0;
        const auto rest = static_cast<utf8proc_ssize_t>(text_.size() - i);
        const utf8proc_ssize_t length = utf8proc_iterate(asBytes(text_.data()) + i, rest, &codePoint);
        if (length <= 0 || codePoint == 0) return malformedFile(line, "the text is not UTF-8");
        if (codePoint == '\n') ++line;
        i += static_cast<std::size_t>(length);
    }
    return std::nullopt;
}

OptionalError StringsParser::parseEntry() {
    const Result<Range> key = parseQuoted();
    if (!key) return key.error();
    if (key->length == 0) return malformed("the key is empty");
    if (OptionalError error = expect('=')) return error;
    if (OptionalError error = skipBlanks()) return error;
    const Result<Range> text = parseQuoted();
    if (!text) return text.error();
    if (OptionalError error = expect(';')) return error;
    table_.entries_.push_back({key->start, key->length, text->start, text->length});
    return std::nullopt;
}

OptionalError StringsParser::skipBlanks() {
    while (!atEnd()) {
        const char character = text_[position_];
        if (character == '/') {
            if (OptionalError error = skipComment()) return error;
        } else if (character == ' ' || character == '\t' || character == '\r' || character == '\n') {
            if (character == '\n') ++line_;
            ++position_;
        } else {
            break;
        }
    }
    return std::nullopt;
}

OptionalError StringsParser::skipComment() {
    const std::string_view rest = std::string_view(text_).substr(position_);
    const bool isBlock = rest.starts_with("/*");
    if (!isBlock && !rest.starts_with("//")) return malformed("a single slash");
    const std::size_t end = isBlock ? rest.find("*/", 2) : std::min(rest.find('\n'), rest.size());
    if (end == std::string_view::npos) return malformed("the comment does not end");
    const std::size_t length = end + (isBlock ? 2 : 0);
    line_ += static_cast<std::size_t>(
        std::count(rest.begin(), rest.begin() + static_cast<std::ptrdiff_t>(length), '\n'));
    position_ += length;
    return std::nullopt;
}

OptionalError StringsParser::expect(char character) {
    if (OptionalError error = skipBlanks()) return error;
    if (atEnd() || text_[position_] != character) return malformed(std::string("expected ") + character);
    ++position_;
    return std::nullopt;
}

Result<StringsParser::Range> StringsParser::parseQuoted() {
    if (atEnd() || text_[position_] != '"') return malformed("expected a text in quotes");
    const std::size_t start = ++position_;
    std::size_t out = start;
    while (!atEnd() && text_[position_] != '"') {
        if (text_[position_] == '\\') {
            if (const OptionalError error = unescape(out)) return *error;
        } else {
            if (text_[position_] == '\n') ++line_;
            text_[out++] = text_[position_++];
        }
    }
    if (atEnd()) return malformed("the text does not end");
    ++position_;
    return Range{static_cast<std::uint32_t>(start), static_cast<std::uint32_t>(out - start)};
}

OptionalError StringsParser::unescape(std::size_t& out) {
    constexpr std::string_view kEscapes = "\"\\'ntr";
    constexpr std::string_view kMeanings = "\"\\'\n\t\r";
    if (++position_ >= text_.size()) return malformed("the text does not end");
    const char character = text_[position_];
    if (character == 'U' || character == 'u') return unescapeCodePoint(out);
    const std::size_t which = kEscapes.find(character);
    if (which == std::string_view::npos) return malformed("an unknown escape");
    text_[out++] = kMeanings[which];
    ++position_;
    return std::nullopt;
}

OptionalError StringsParser::unescapeCodePoint(std::size_t& out) {
    constexpr std::size_t kDigits = 4;
    const std::string_view digits = std::string_view(text_).substr(position_ + 1, kDigits);
    utf8proc_int32_t codePoint = 0;
    const char* end = digits.data() + digits.size();
    if (digits.size() < kDigits || std::from_chars(digits.data(), end, codePoint, 16).ptr != end ||
        codePoint <= 0) {
        return malformed("an escape needs four hexadecimal digits");
    }
    if (!utf8proc_codepoint_valid(codePoint)) return malformed("an escape that is no character");
    utf8proc_uint8_t encoded[4];
    const utf8proc_ssize_t length = utf8proc_encode_char(codePoint, encoded);
    std::copy_n(encoded, length, text_.begin() + static_cast<std::ptrdiff_t>(out));
    out += static_cast<std::size_t>(length);
    position_ += 1 + kDigits;
    return std::nullopt;
}

OptionalError StringsParser::sortEntries() {
    auto& entries = table_.entries_;
    const auto key = [this](const auto& entry) { return table_.keyOf(entry); };
    std::ranges::sort(entries, {}, key);
    const auto twin = std::ranges::adjacent_find(entries, {}, key);
    if (twin == entries.end()) return std::nullopt;
    return malformedFile(0, "the key \"" + std::string(table_.keyOf(*twin)) + "\" stands twice");
}

}  // namespace kelvo
