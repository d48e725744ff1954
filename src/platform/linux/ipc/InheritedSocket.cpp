#include "platform/linux/ipc/InheritedSocket.h"

#include <charconv>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

namespace kelvo {
namespace {

constexpr int kFirstDescriptor = 3;
constexpr int kMostDescriptors = 64;

/// The number in a variable of the environment, which nothing here changes; 0 without one.
int numberInEnvironment(const char* name) {
    const char* const text = std::getenv(name);  // NOLINT(concurrency-mt-unsafe)
    if (text == nullptr) return 0;
    int number = 0;
    const char* const end = text + std::strlen(text);
    const auto [rest, error] = std::from_chars(text, end, number);
    return error == std::errc() && rest == end ? number : 0;
}

bool isListening(int descriptor) {
    int flag = 0;
    socklen_t size = sizeof(flag);
    return ::getsockopt(descriptor, SOL_SOCKET, SO_ACCEPTCONN, &flag, &size) == 0 && flag != 0;
}

/// The last part of the path that a socket is bound to.
std::string_view nameOf(int descriptor, sockaddr_un& address) {
    socklen_t size = sizeof(address);
    if (::getsockname(descriptor, reinterpret_cast<sockaddr*>(&address), &size) != 0 ||
        address.sun_family != AF_UNIX)
        return {};
    const std::string_view path(address.sun_path, ::strnlen(address.sun_path, sizeof(address.sun_path)));
    return path.substr(path.rfind('/') + 1);
}

}  // namespace

UniqueFd inheritedSocket(std::string_view serviceName) {
    // Descriptors meant for a process that became this one's parent are not ours.
    if (numberInEnvironment("LISTEN_PID") != ::getpid()) return UniqueFd();
    const int count = numberInEnvironment("LISTEN_FDS");
    for (int each = kFirstDescriptor; each < kFirstDescriptor + count && each < kMostDescriptors; ++each) {
        sockaddr_un address{};
        if (!isListening(each) || nameOf(each, address) != serviceName) continue;
        ::fcntl(each, F_SETFD, FD_CLOEXEC);
        ::fcntl(each, F_SETFL, O_NONBLOCK);
        // The original stays, so that a listener which is made anew finds it again.
        return UniqueFd(::fcntl(each, F_DUPFD_CLOEXEC, 0));
    }
    return UniqueFd();
}

}  // namespace kelvo
