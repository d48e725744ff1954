#pragma once

#include "base/Result.h"

#include <optional>
#include <string>
#include <string_view>

namespace kelvo {

/// What a bundle's `Info.json` says. Keys that are not listed here are passed over.
struct BundleInfo {
    /// The largest file that is read, and the most entries that its three sections may hold together.
    static constexpr std::size_t kMostBytes = 256U << 10;
    static constexpr std::size_t kMostEntries = 256;

    std::string identifier;
    std::optional<std::string> name;
    std::optional<std::string> displayName;
    std::string executable;  ///< relative to the folder
    std::string icon;        ///< likewise
    std::string developmentLanguage = "en";
    Dictionary localizedNames;  ///< display names by language tag
    Dictionary entitlements;    ///< rights by name: booleans, numbers, texts or arrays of these
    Dictionary extension;       ///< of an extension, the same kinds of values

    /// Reads the file's text. Fails, saying what is wrong, on anything that is not a JSON object in UTF-8, on
    /// a known key of the wrong type, and beyond these bounds: 32 levels of nesting, 4096 bytes a text or
    /// number, and the two above.
    static Result<BundleInfo> parse(std::string_view json);
};

}  // namespace kelvo
