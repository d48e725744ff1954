#pragma once

#include <array>
#include <span>
#include <string>
#include <string_view>

namespace kelvo {

/// Fills a localized text's placeholders with texts: "%@" takes the next argument, "%2$@" the second, "%%" is
/// a percent sign. A translation may be wrong without harm: a placeholder without an argument becomes empty,
/// an argument without a placeholder is left out, and anything else after a percent sign stays as it stands.
/// Thread-safe.
std::string formatLocalized(std::string_view format, std::span<const std::string_view> arguments);

template <typename... Texts>
std::string formatLocalized(std::string_view format, const Texts&... texts) {
    const std::array<std::string_view, sizeof...(Texts)> arguments{std::string_view(texts)...};
    return formatLocalized(format, std::span<const std::string_view>(arguments));
}

/// How many arguments `format` asks for: the highest position that one of its placeholders names.
std::size_t placeholderCount(std::string_view format);

}  // namespace kelvo
