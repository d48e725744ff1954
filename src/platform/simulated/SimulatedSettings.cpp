#include "platform/simulated/SimulatedSettings.h"

#include <cctype>

namespace kelvo {

void SimulatedRandom::fill(std::span<std::byte> bytes) {
    state_.with([&](std::uint64_t& state) {
        for (std::byte& byte : bytes) {
            state ^= state << 13;
            state ^= state >> 7;
            state ^= state << 17;
            byte = static_cast<std::byte>(state);
        }
    });
}

namespace {

/// How many bytes the character at the start of `text` has; 0 when no character stands there.
std::size_t characterLength(std::string_view text) {
    const auto first = static_cast<unsigned char>(text.front());
    if (first < 0x80) return 1;
    if (first < 0xC2 || first > 0xF4) return 0;
    const std::size_t length = first < 0xE0 ? 2 : first < 0xF0 ? 3 : 4;
    if (text.size() < length) return 0;
    for (std::size_t i = 1; i < length; ++i) {
        if ((static_cast<unsigned char>(text[i]) & 0xC0U) != 0x80) return 0;
    }
    return length;
}

bool isUTF8(std::string_view text) {
    while (!text.empty()) {
        const std::size_t length = characterLength(text);
        if (length == 0) return false;
        text.remove_prefix(length);
    }
    return true;
}

}  // namespace

std::string SimulatedTextFolding::folded(std::string_view text) {
    if (!isUTF8(text)) return std::string(text);
    // The base letters of U+00E0 to U+00FF; in UTF-8 these are the byte 0xC3 and one of 0xA0 to 0xBF, and
    // their capitals lie 0x20 below. A dot is a letter of its own, or none.
    constexpr std::string_view kBaseLetters = "aaaaaa.ceeeeiiii.nooooo..uuuuy.y";
    std::string result;
    for (std::size_t i = 0; i < text.size(); ++i) {
        const auto byte = static_cast<unsigned char>(text[i]);
        if (byte != 0xC3) {
            result += static_cast<char>(std::tolower(byte));
            continue;
        }
        auto second = static_cast<unsigned char>(text[++i]);
        const bool isCapital = second <= 0x9E && second != 0x97;  // not the multiplication sign
        if (isCapital) second = static_cast<unsigned char>(second + 0x20);
        const char base = second >= 0xA0 ? kBaseLetters[second - 0xA0U] : '.';
        result += base != '.' ? std::string(1, base) : std::string{'\xC3', static_cast<char>(second)};
    }
    return result;
}

}  // namespace kelvo
