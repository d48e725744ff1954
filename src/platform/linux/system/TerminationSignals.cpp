#include "platform/linux/system/TerminationSignals.h"

#include "base/ThreadName.h"

#include <array>
#include <csignal>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/signalfd.h>
#include <unistd.h>
#include <utility>

namespace kelvo {
namespace {

/// As it is under nohup. A signal that is blocked would come all the same.
bool isIgnored(int signal) {
    struct sigaction action {};
    return ::sigaction(signal, nullptr, &action) == 0 && action.sa_handler == SIG_IGN;
}

}  // namespace

TerminationSignals::TerminationSignals() : stopEvent_(::eventfd(0, EFD_CLOEXEC)) {
    std::signal(SIGPIPE, SIG_IGN);
    sigset_t set;
    sigemptyset(&set);
    sigaddset(&set, SIGTERM);
    sigaddset(&set, SIGINT);
    if (!isIgnored(SIGHUP)) sigaddset(&set, SIGHUP);
    ::pthread_sigmask(SIG_BLOCK, &set, nullptr);
    signals_.reset(::signalfd(-1, &set, SFD_CLOEXEC));
}

TerminationSignals::~TerminationSignals() {
    if (!watcher_.joinable()) return;
    ::eventfd_write(stopEvent_.get(), 1);
    watcher_.join();
}

void TerminationSignals::exitAfter(unsigned seconds) {
    std::signal(SIGALRM, [](int) { ::_exit(0); });
    ::alarm(seconds);
}

void TerminationSignals::watch(std::function<void()> handler) {
    watcher_ = std::thread([this, handler = std::move(handler)] {
        nameCurrentThread("kelvo.signals");
        std::array<pollfd, 2> sources{{{signals_.get(), POLLIN, 0}, {stopEvent_.get(), POLLIN, 0}}};
        while (::poll(sources.data(), sources.size(), -1) < 0) {
        }
        if (sources[0].revents != 0) handler();
    });
}

}  // namespace kelvo
