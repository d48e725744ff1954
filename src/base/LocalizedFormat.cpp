#include "base/LocalizedFormat.h"

#include <algorithm>
#include <cctype>

namespace kelvo {
namespace {

/// One placeholder as it stands behind a percent sign.
struct Placeholder {
    std::size_t length = 0;    // characters from the percent sign on; 0 when there is no placeholder
    std::size_t position = 0;  // 1-based; 0 takes the next argument
};

Placeholder placeholderAt(std::string_view text) {
    if (text.substr(0, 2) == "%@") return {2, 0};
    // Positions of one or two digits are all that a text could need.
    std::size_t position = 0;
    std::size_t i = 1;
    while (i < text.size() && i <= 2 && std::isdigit(static_cast<unsigned char>(text[i])) != 0) {
        position = position * 10 + static_cast<std::size_t>(text[i++] - '0');
    }
    if (position > 0 && text.substr(i, 2) == "$@") return {i + 2, position};
    return {};
}

/// Walks `format` and hands each literal stretch and each placeholder's 1-based position to the callbacks.
template <typename OnText, typename OnPlaceholder>
void walk(std::string_view format, OnText onText, OnPlaceholder onPlaceholder) {
    std::size_t next = 1;
    while (!format.empty()) {
        const std::size_t literal = std::min(format.find('%'), format.size());
        onText(format.substr(0, literal));
        format.remove_prefix(literal);
        if (format.empty()) return;
        if (const Placeholder found = placeholderAt(format); found.length > 0) {
            onPlaceholder(found.position > 0 ? found.position : next++);
            format.remove_prefix(found.length);
        } else {
            onText(format.substr(0, 1));
            format.remove_prefix(format.substr(0, 2) == "%%" ? 2 : 1);
        }
    }
}

}  // namespace

std::string formatLocalized(std::string_view format, std::span<const std::string_view> arguments) {
    std::string text;
    walk(
        format, [&](std::string_view literal) { text += literal; },
        [&](std::size_t position) {
            if (position <= arguments.size()) text += arguments[position - 1];
        });
    return text;
}

std::size_t placeholderCount(std::string_view format) {
    std::size_t count = 0;
    walk(
        format, [](std::string_view) {}, [&](std::size_t position) { count = std::max(count, position); });
    return count;
}

}  // namespace kelvo
