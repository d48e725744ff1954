#include "support/DescriptorPassing.h"
#include "support/x11/XClient.h"

#include <array>
#include <chrono>
#include <cinttypes>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <sys/un.h>
#include <thread>
#include <unistd.h>

namespace {

int connectTo(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof(address.sun_path) - 1);
    const int connection = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const bool isMade =
        ::connect(connection, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) == 0;
    return isMade ? connection : -1;
}

}  // namespace

/// client_program SOCKET PARENT [DISPLAY X Y WIDTH HEIGHT]: an application whose bundle is the one that this
/// program lies in. Shows a managed window and counts in it 60 times a second, with a place to show it;
/// standard error tells which window. Connects to the daemon's socket and hands the connection to whoever is
/// behind the descriptor PARENT: what comes over it is this process's to the daemon. Lives until it is
/// killed.
int main(int argumentCount, char** arguments) {
    using kelvo::test::XClient;
    if (argumentCount != 3 && argumentCount != 8) return 2;
    std::unique_ptr<XClient> screen;
    std::uint32_t window = 0;
    if (argumentCount == 8) {
        const auto number = [&](int index) { return std::atoi(arguments[index]); };
        screen = std::make_unique<XClient>(arguments[3]);
        window = screen->createWindow({number(4), number(5), number(6), number(7)}, 0, true);
    }
    std::fprintf(stderr, "window %" PRIu32 "\n", window);
    const int connection = connectTo(arguments[1]);
    if (connection < 0 || !kelvo::test::sendDescriptor(std::atoi(arguments[2]), connection)) return 1;
    ::close(connection);
    constexpr std::chrono::nanoseconds kInterval{1000000000 / 60};
    auto next = std::chrono::steady_clock::now();
    for (std::uint32_t number = 1;; ++number) {
        std::this_thread::sleep_until(next += kInterval);
        if (screen) screen->showNumber(window, number);
    }
}
