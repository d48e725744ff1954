#include "platform/linux/text/UnicodeTextFolding.h"

#include <cstdlib>
#include <memory>
#include <utf8proc.h>

namespace kelvo {

std::string UnicodeTextFolding::folded(std::string_view text) {
    constexpr auto kOptions = static_cast<utf8proc_option_t>(UTF8PROC_DECOMPOSE | UTF8PROC_CASEFOLD |
                                                             UTF8PROC_STRIPMARK | UTF8PROC_STABLE);
    utf8proc_uint8_t* mapped = nullptr;
    const utf8proc_ssize_t length =
        utf8proc_map(reinterpret_cast<const utf8proc_uint8_t*>(text.data()),
                     static_cast<utf8proc_ssize_t>(text.size()), &mapped, kOptions);
    const std::unique_ptr<utf8proc_uint8_t, decltype(&std::free)> owned(mapped, &std::free);
    if (length < 0) return std::string(text);
    return {reinterpret_cast<const char*>(mapped), static_cast<std::size_t>(length)};
}

}  // namespace kelvo
