#pragma once

#include <string_view>

namespace kelvo {

/// Whether text is well-formed UTF-8, without surrogates and overlong forms.
bool isUTF8(std::string_view text);

}  // namespace kelvo
