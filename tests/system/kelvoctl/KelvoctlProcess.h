#pragma once

#include "support/ChildProcess.h"

#include <string>
#include <vector>

namespace kelvo::test {

/// kelvoctl as its own process, on a socket and, perhaps, a display. What it prints on both outputs is the
/// process's `output`.
class KelvoctlProcess : public ChildProcess {
  public:
    KelvoctlProcess(const std::string& socket, const std::vector<std::string>& arguments,
                    const std::string& program = KELVOCTL_PROGRAM, const std::string& display = {})
        : ChildProcess(command(program, arguments, "exec \"$0\" \"$@\" 1>&2"), environment(socket, display)) {
    }

    /// The exit status, or none when it does not end within a minute: mixing takes a while on a busy machine.
    std::optional<int> waitForEnd() {
        std::optional<int> status;
        for (int attempt = 0; attempt < 6 && !status; ++attempt)
            status = waitForExit();
        return status;
    }

    /// The exit status of a command that ends by itself, and what it printed on both outputs.
    static std::pair<int, std::string> run(const std::string& socket,
                                           const std::vector<std::string>& arguments) {
        KelvoctlProcess process(socket, arguments);
        const int status = process.waitForEnd().value_or(-1);
        return {status, process.output()};
    }

    /// What a command prints on standard output alone.
    static std::string answer(const std::string& socket, const std::vector<std::string>& arguments) {
        ChildProcess process(
            command(KELVOCTL_PROGRAM, arguments, "exec 3>&2 2>/dev/null; exec \"$0\" \"$@\" 1>&3"),
            environment(socket, {}));
        process.waitForExit();
        return process.output();
    }

  private:
    static std::vector<std::string> command(const std::string& program,
                                            const std::vector<std::string>& arguments,
                                            const std::string& script) {
        std::vector<std::string> all{"sh", "-c", script, program};
        all.insert(all.end(), arguments.begin(), arguments.end());
        return all;
    }
    static std::map<std::string, std::string> environment(const std::string& socket,
                                                          const std::string& display) {
        return {{"KELVO_SOCKET", socket}, {"DISPLAY", display}};
    }
};

}  // namespace kelvo::test
