#pragma once

#include "tools/kelvoctl/Program.h"

#include <memory>

namespace kelvo::ctl {

/// Begins the command of the program's line. What is returned is kept until the program ends.
std::shared_ptr<void> beginCommand(Program& program);

std::shared_ptr<void> beginRecord(Program& program);
std::shared_ptr<void> beginStop(Program& program);
std::shared_ptr<void> beginPause(Program& program);
std::shared_ptr<void> beginResume(Program& program);
std::shared_ptr<void> beginStatus(Program& program);
std::shared_ptr<void> beginExtensions(Program& program);
std::shared_ptr<void> beginLibrary(Program& program);
std::shared_ptr<void> beginWatch(Program& program);
std::shared_ptr<void> beginShell(Program& program);

}  // namespace kelvo::ctl
