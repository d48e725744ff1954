#pragma once

namespace kelvo::ctl {

/// What the program's exit statuses mean; `--help` tells them, scripts compare them.
enum ExitStatus : int {
    kDone = 0,
    kRefused = 1,      ///< the daemon answered with an error, or the recording failed
    kWrongUsage = 2,   ///< wrong arguments
    kNoDaemon = 3,     ///< no daemon answers, or it went away
    kNothingToDo = 4,  ///< nothing is being recorded; or, to `record`, something already is
};

}  // namespace kelvo::ctl
