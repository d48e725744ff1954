#pragma once

#include "base/Result.h"

#include <string>
#include <string_view>
#include <vector>

namespace kelvo {

/// What the "[Desktop Entry]" group of a desktop entry says. Keys that are not listed here, and other groups,
/// are passed over.
struct DesktopEntryFile {
    /// The largest file that is read.
    static constexpr std::size_t kMostBytes = 256U << 10;

    bool isApplication = false;
    bool isHidden = false;       ///< it says that there is no such application
    bool isForTerminal = false;  ///< its program has no windows of its own
    std::string name;
    Dictionary localizedNames;  ///< by language tag, with the plain name as English if English has none
    std::string icon;           ///< an absolute path or a name for the icon theme
    std::vector<std::string> command;  ///< program and arguments, without the places for files and the like

    /// Reads the file's text. Fails, saying where, on anything that is not such a group in UTF-8, on a
    /// command whose quotes do not end, and on a text of more than 4096 bytes or more than 1024 names.
    static Result<DesktopEntryFile> parse(std::string_view text);

    /// Whether the command is the program alone, but for options: with other arguments it may be an
    /// interpreter that runs something else.
    bool speaksForItsProgram() const;
    /// Whether there are no options either.
    bool isPlain() const { return command.size() == 1; }
};

}  // namespace kelvo
