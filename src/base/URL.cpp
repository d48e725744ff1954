#include "base/URL.h"

#include <cctype>
#include <charconv>

namespace kelvo {
namespace {

constexpr std::string_view kFileScheme = "file://";

bool mayStandInPath(unsigned char byte) {
    return std::isalnum(byte) != 0 ||
           std::string_view("/-._~!$&'()*+,;=:@").find(static_cast<char>(byte)) != std::string_view::npos;
}

}  // namespace

URL URL::file(std::string_view path) {
    constexpr char kDigits[] = "0123456789ABCDEF";
    std::string text(kFileScheme);
    for (const char character : path) {
        const auto byte = static_cast<unsigned char>(character);
        if (mayStandInPath(byte)) {
            text += character;
        } else {
            text += '%';
            text += kDigits[byte >> 4];
            text += kDigits[byte & 0x0F];
        }
    }
    return URL(std::move(text));
}

bool URL::isFileURL() const {
    return absoluteString_.starts_with(kFileScheme);
}

std::string URL::path() const {
    if (!isFileURL()) return {};
    const std::string_view encoded = std::string_view(absoluteString_).substr(kFileScheme.size());
    std::string path;
    for (std::size_t i = 0; i < encoded.size(); ++i) {
        unsigned byte = 0;
        if (encoded[i] == '%' && i + 2 < encoded.size()) {
            const char* digits = encoded.data() + i + 1;
            // An encoded NUL stays encoded: a path that held one would be cut short by the system.
            if (std::from_chars(digits, digits + 2, byte, 16).ptr == digits + 2 && byte != 0) {
                path += static_cast<char>(byte);
                i += 2;
                continue;
            }
        }
        path += encoded[i];
    }
    return path;
}

}  // namespace kelvo
