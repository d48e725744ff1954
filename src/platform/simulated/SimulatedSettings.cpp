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

std::string SimulatedTextFolding::folded(std::string_view text) {
    // The base letters of U+00C0 to U+00DF; in UTF-8 these are the byte 0xC3 and one of 0x80 to 0x9F, and
    // their small forms lie 0x20 above. A dot keeps the letter as it is.
    constexpr std::string_view kBaseLetters = "aaaaaa.ceeeeiiii.nooooo.ouuuuy..";
    std::string result;
    for (std::size_t i = 0; i < text.size(); ++i) {
        const auto byte = static_cast<unsigned char>(text[i]);
        const auto next = i + 1 < text.size() ? static_cast<unsigned char>(text[i + 1]) : 0U;
        if (byte == 0xC3 && next >= 0x80 && next <= 0xBF && kBaseLetters[(next - 0x80U) & 0x1FU] != '.') {
            result += kBaseLetters[(next - 0x80U) & 0x1FU];
            ++i;
        } else {
            result += static_cast<char>(std::tolower(byte));
        }
    }
    return result;
}

}  // namespace kelvo
