#pragma once

#include "base/Result.h"

#include <span>
#include <string>

namespace kelvo {

/// What the command line asks of the daemon.
struct Options {
    enum class Action { run, showHelp, showVersion };
    enum class Log { journal, standardError };

    Action action = Action::run;
    Log log = Log::journal;
    std::string root = "/";
    std::string resourceFolder;  ///< empty: the installed one
    bool savesToUsersVideos = false;
    bool logsSamples = true;

    /// Reads the arguments behind the program's name. The error's description says which one is wrong and
    /// how.
    static Result<Options> parse(std::span<const char* const> arguments);

    /// The text of `--help`.
    static const char* helpText();
};

}  // namespace kelvo
