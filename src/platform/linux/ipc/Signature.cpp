#include "platform/linux/ipc/Signature.h"

#include "platform/IPCBounds.h"

namespace kelvo::dbus {
namespace {

constexpr std::string_view kBasicTypes = "ybnqiuxtdsogh";
constexpr std::size_t kLongestSignature = 255;

/// The length of the complete type that `text` begins with; 0 when it begins with none.
std::size_t typeLength(std::string_view text, int depth) {
    if (text.empty() || depth > ipc_bounds::kDeepestNesting) return 0;
    if (text[0] == 'v' || kBasicTypes.find(text[0]) != std::string_view::npos) return 1;
    if (text.starts_with("a{")) {
        if (text.size() < 5 || kBasicTypes.find(text[2]) == std::string_view::npos) return 0;
        const std::size_t value = typeLength(text.substr(3), depth + 1);
        return value != 0 && text.size() > 3 + value && text[3 + value] == '}' ? value + 4 : 0;
    }
    if (text[0] == 'a') {
        const std::size_t element = typeLength(text.substr(1), depth + 1);
        return element == 0 ? 0 : element + 1;
    }
    if (text[0] != '(') return 0;
    std::size_t end = 1;
    while (end < text.size() && text[end] != ')') {
        const std::size_t field = typeLength(text.substr(end), depth + 1);
        if (field == 0) return 0;
        end += field;
    }
    return end > 1 && end < text.size() ? end + 1 : 0;
}

}  // namespace

std::optional<std::string_view> SignatureParts::next() {
    // The element of a dictionary's array is asked for as a whole, so that "{sv}" stands for itself.
    const std::size_t length = typeLength(rest_, 0);
    if (length == 0) return std::nullopt;
    const std::string_view part = rest_.substr(0, length);
    rest_.remove_prefix(length);
    return part;
}

bool isValidSignature(std::string_view signature) {
    if (signature.size() > kLongestSignature) return false;
    while (!signature.empty()) {
        const std::size_t length = typeLength(signature, 0);
        if (length == 0) return false;
        signature.remove_prefix(length);
    }
    return true;
}

bool isSingleType(std::string_view signature) {
    return !signature.empty() && typeLength(signature, 0) == signature.size();
}

}  // namespace kelvo::dbus
