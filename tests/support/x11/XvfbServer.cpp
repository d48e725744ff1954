#include "support/x11/XvfbServer.h"

#include <csignal>
#include <sys/stat.h>
#include <unistd.h>

namespace kelvo::test {

std::string XvfbServer::ownDisplay() {
    constexpr int kFirst = 9000;
    constexpr int kCount = 50000;
    return ":" + std::to_string(kFirst + ::getpid() % kCount);
}

XvfbServer::XvfbServer(int width, int height, const std::string& display, const std::string& options)
    : isNumberOurs_(!display.empty()) {
    // Servers that start at once race to make the folder of their sockets.
    ::mkdir("/tmp/.X11-unix", 01777);
    ::chmod("/tmp/.X11-unix", 01777);
    // The server writes its number, and nothing else, to where the test reads.
    const std::string command = "exec Xvfb " + display + " -displayfd 3 -screen 0 " + std::to_string(width) +
                                "x" + std::to_string(height) + "x24 -nolisten tcp -noreset " + options +
                                " 3>&2 2>/dev/null";
    process_ = std::make_unique<ChildProcess>(std::vector<std::string>{"sh", "-c", command});
    if (!process_->waitForLine("\n")) return;
    const std::string& answer = process_->output();
    display_ = ":" + answer.substr(0, answer.find('\n'));
}

XvfbServer::~XvfbServer() {
    process_.reset();
    if (!isNumberOurs_ || display_.empty()) return;
    // It was killed; the files of other numbers may be those of a new server by now.
    const std::string number = display_.substr(1);
    ::unlink(("/tmp/.X11-unix/X" + number).c_str());
    ::unlink(("/tmp/.X" + number + "-lock").c_str());
}

void XvfbServer::kill() {
    process_->signal(SIGKILL);
    process_->waitForExit();
}

void XvfbServer::freeze() {
    process_->signal(SIGSTOP);
}

void XvfbServer::thaw() {
    process_->signal(SIGCONT);
}

}  // namespace kelvo::test
