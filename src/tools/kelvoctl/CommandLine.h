#pragma once

#include "base/Geometry.h"
#include "base/Result.h"
#include "platform/SystemAlert.h"

#include <optional>
#include <span>
#include <string>

namespace kelvo::ctl {

enum class Command { none, record, stop, pause, resume, status, extensions, library, watch, shell };

/// What the command line asks for.
struct CommandLine {
    Command command = Command::none;
    bool wantsHelp = false;
    bool wantsVersion = false;
    bool isJson = false;
    std::string socket;  ///< empty: the usual one
    std::optional<double> seconds;
    bool wantsMicrophone = false;
    std::string output;
    std::optional<Size> size;
    std::optional<SystemAlertResponse> answer;
    bool isRecovery = false;  ///< of `library`

    /// Reads the arguments behind the program's name. The error's description says which one is wrong and
    /// how. Options may stand before and behind the command; those that it does not take are errors.
    static Result<CommandLine> parse(std::span<const char* const> arguments);

    /// The text of `--help`: the whole program's, or that of one command.
    static std::string helpText(Command command);
};

}  // namespace kelvo::ctl
