#include "tools/kelvoctl/Keys.h"

#include <array>
#include <cerrno>
#include <poll.h>
#include <sys/eventfd.h>
#include <termios.h>
#include <unistd.h>

namespace kelvo::ctl {

/// The terminal's settings, put back at the end.
struct Keys::Terminal {
    Terminal() : isTerminal_(::tcgetattr(STDIN_FILENO, &before_) == 0) {
        if (!isTerminal_) return;
        termios settings = before_;
        settings.c_lflag &= ~static_cast<tcflag_t>(ICANON | ECHO);
        ::tcsetattr(STDIN_FILENO, TCSANOW, &settings);
    }
    ~Terminal() {
        if (isTerminal_) ::tcsetattr(STDIN_FILENO, TCSANOW, &before_);
    }
    Terminal(const Terminal&) = delete;
    Terminal& operator=(const Terminal&) = delete;

  private:
    termios before_{};
    const bool isTerminal_;
};

Keys::Keys(std::function<void(char)> handler)
    : terminal_(std::make_unique<Terminal>()), stopEvent_(::eventfd(0, EFD_CLOEXEC)) {
    reader_ = std::thread([this, handler = std::move(handler)] { read(handler); });
}

Keys::~Keys() {
    ::eventfd_write(stopEvent_.get(), 1);
    reader_.join();
}

void Keys::read(const std::function<void(char)>& handler) const {
    std::array<pollfd, 2> sources{{{STDIN_FILENO, POLLIN, 0}, {stopEvent_.get(), POLLIN, 0}}};
    while (true) {
        if (::poll(sources.data(), sources.size(), -1) < 0 && errno != EINTR) return;
        if (sources[1].revents != 0) return;
        if (sources[0].revents == 0) continue;
        char key = 0;
        if (::read(STDIN_FILENO, &key, 1) != 1) return;
        handler(key);
    }
}

}  // namespace kelvo::ctl
