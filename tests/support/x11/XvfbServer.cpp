#include "support/x11/XvfbServer.h"

#include "base/UniqueFd.h"

#include <array>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace kelvo::test {
namespace {

/// Reads up to the end of the first line; empty when the writer ends before it.
std::string readLine(int descriptor) {
    std::string line;
    char character = 0;
    while (::read(descriptor, &character, 1) == 1) {
        if (character == '\n') return line;
        line += character;
    }
    return {};
}

}  // namespace

XvfbServer::XvfbServer(int width, int height, const std::string& display) {
    // Servers that start at once race to make the folder of their sockets.
    ::mkdir("/tmp/.X11-unix", 01777);
    ::chmod("/tmp/.X11-unix", 01777);
    std::array<int, 2> ends{};
    if (::pipe2(ends.data(), O_CLOEXEC) != 0) return;
    const UniqueFd readEnd(ends[0]);
    UniqueFd writeEnd(ends[1]);
    const std::string mode = std::to_string(width) + "x" + std::to_string(height) + "x24";
    std::vector<std::string> command{"Xvfb",      "-displayfd", std::to_string(writeEnd.get()),
                                     "-screen",   "0",          mode,
                                     "-nolisten", "tcp",        "-noreset"};
    if (!display.empty()) command.insert(command.begin() + 1, display);
    process_ = std::make_unique<ChildProcess>(command, std::vector<int>{writeEnd.get()});
    writeEnd.reset();
    const std::string number = readLine(readEnd.get());
    if (!number.empty()) display_ = ":" + number;
}

}  // namespace kelvo::test
