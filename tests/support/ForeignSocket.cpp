#include "ForeignSocket.h"

#include "DescriptorPassing.h"

#include <array>
#include <csignal>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

namespace kelvo::test {
namespace {

/// The process's life. Forked from a process with threads, so nothing but system calls.
[[noreturn]] void run(int parent, const sockaddr_un& address) {
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);  // a test that crashes leaves nobody behind
    char go = 0;
    if (::read(parent, &go, 1) != 1) ::_exit(1);
    const int connection = ::socket(AF_UNIX, SOCK_STREAM, 0);
    if (::connect(connection, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0) ::_exit(2);
    if (!sendDescriptor(parent, connection)) ::_exit(3);
    ::close(connection);
    ::pause();
    ::_exit(0);
}

}  // namespace

ForeignSocket::ForeignSocket(const std::string& path, const std::function<void(pid_t)>& beforeConnecting) {
    std::array<int, 2> ends{-1, -1};
    if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()) != 0) return;
    const UniqueFd own(ends[0]);
    UniqueFd child(ends[1]);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof(address.sun_path) - 1);
    processIdentifier_ = ::fork();
    if (processIdentifier_ == 0) run(child.get(), address);
    child.reset();
    beforeConnecting(processIdentifier_);
    if (::write(own.get(), "g", 1) == 1) socket_ = receiveDescriptor(own.get());
}

void ForeignSocket::kill() {
    if (processIdentifier_ <= 0 || isKilled_) return;
    isKilled_ = true;
    ::kill(processIdentifier_, SIGKILL);
    ::waitpid(processIdentifier_, nullptr, 0);
}

}  // namespace kelvo::test
