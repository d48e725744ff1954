#include "base/UTF8.h"

#include <cstdint>

namespace kelvo {

bool isUTF8(std::string_view text) {
    for (std::size_t i = 0; i < text.size();) {
        const auto lead = static_cast<unsigned char>(text[i++]);
        if (lead < 0x80) continue;
        const int more = lead >= 0xf0 ? 3 : lead >= 0xe0 ? 2 : 1;
        if (lead < 0xc2 || lead > 0xf4) return false;
        std::uint32_t code = lead & (0x3fU >> more);
        for (int k = 0; k < more; ++k) {
            if (i == text.size() || (static_cast<unsigned char>(text[i]) & 0xc0) != 0x80) return false;
            code = code << 6 | (static_cast<unsigned char>(text[i++]) & 0x3fU);
        }
        const bool isOverlong = (more == 2 && code < 0x800) || (more == 3 && code < 0x10000);
        if (isOverlong || (code >= 0xd800 && code < 0xe000) || code > 0x10ffff) return false;
    }
    return true;
}

}  // namespace kelvo
