#include "tools/kelvoctl/Program.h"

#include <cstdio>

int main(int argumentCount, char** arguments) {
    using namespace kelvo::ctl;
    const auto line = CommandLine::parse(
        {arguments + 1, static_cast<std::size_t>(argumentCount > 0 ? argumentCount - 1 : 0)});
    if (!line) {
        std::fprintf(stderr, "kelvoctl: %s\n", line.error().localizedDescription().c_str());
        return kWrongUsage;
    }
    if (line->wantsHelp) return std::fputs(CommandLine::helpText(line->command).c_str(), stdout) < 0;
    if (line->wantsVersion) return std::puts("kelvoctl " KELVO_VERSION) < 0;
    kelvo::TerminationSignals signals;
    Program program(*line);
    return program.run(signals);
}
