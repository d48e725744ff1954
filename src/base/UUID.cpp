#include "base/UUID.h"

namespace kelvo {

UUID UUID::fromRandomBytes(std::array<std::uint8_t, 16> random) {
    random[6] = static_cast<std::uint8_t>((random[6] & 0x0F) | 0x40);  // version 4
    random[8] = static_cast<std::uint8_t>((random[8] & 0x3F) | 0x80);  // the standard variant
    return {random};
}

std::string UUID::text() const {
    constexpr char kDigits[] = "0123456789ABCDEF";
    std::string text;
    text.reserve(36);
    for (std::size_t i = 0; i < bytes.size(); ++i) {
        if (i == 4 || i == 6 || i == 8 || i == 10) text += '-';
        text += kDigits[bytes[i] >> 4];
        text += kDigits[bytes[i] & 0x0F];
    }
    return text;
}

}  // namespace kelvo
