#pragma once

#include "base/KVError.h"

#include <string>
#include <string_view>

namespace kelvo {

/// Domain of errors about what a file says; the code is the line, 0 for the file as a whole.
inline constexpr std::string_view kMalformedFileErrorDomain = "KVMalformedFileErrorDomain";

/// The error that `reason` is wrong with a file at `line`.
inline KVError malformedFile(std::size_t line, const std::string& reason) {
    const std::string text = line > 0 ? "line " + std::to_string(line) + ": " + reason : reason;
    return {std::string(kMalformedFileErrorDomain),
            static_cast<std::int64_t>(line),
            {{std::string(kLocalizedDescriptionKey), text}}};
}

}  // namespace kelvo
