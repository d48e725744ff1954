#include "platform/linux/ipc/SocketTransport.h"

#include "platform/linux/ipc/SocketConnection.h"
#include "platform/linux/ipc/SocketListener.h"

#include <array>
#include <cerrno>
#include <sys/socket.h>
#include <sys/un.h>

namespace kelvo {
namespace {

/// How long a listener that takes nobody, with as many waiting as it lets wait, is given.
constexpr timeval kConnectPatience{2, 0};

OptionalError connectTo(const sockaddr_un& address, int socket, const std::string& path) {
    // Sends of a connection never wait, so this is for the connecting alone.
    ::setsockopt(socket, SOL_SOCKET, SO_SNDTIMEO, &kConnectPatience, sizeof(kConnectPatience));
    if (::connect(socket, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) == 0)
        return std::nullopt;
    return KVError::posix(errno == EAGAIN ? ETIMEDOUT : errno, path);
}

}  // namespace

std::string SocketTransport::pathOf(std::string_view serviceName) const {
    return root_->hostPath("/run/kelvod/" + std::string(serviceName));
}

std::shared_ptr<IPCListener> SocketTransport::createListener(std::string_view serviceName) {
    return SocketListener::named(pathOf(serviceName), loop_, bundles_, root_);
}

Result<std::shared_ptr<IPCListener>> SocketTransport::createAnonymousListener() {
    return SocketListener::anonymous(loop_, bundles_, root_);
}

Result<IPCConnectionRef> SocketTransport::connectToService(std::string_view serviceName) {
    return connectToSocket(pathOf(serviceName));
}

Result<IPCConnectionRef> SocketTransport::connectToSocket(const std::string& hostPath) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    if (hostPath.size() >= sizeof(address.sun_path)) return KVError::posix(ENAMETOOLONG, hostPath);
    hostPath.copy(address.sun_path, sizeof(address.sun_path) - 1);
    UniqueFd socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    if (!socket) return KVError::posix(errno, hostPath);
    if (const OptionalError error = connectTo(address, socket.get(), hostPath)) return *error;
    return IPCConnectionRef(std::make_shared<SocketConnection>(
        SocketConnection::Side::client, std::move(socket), loop_, bundles_, root_, nullptr));
}

Result<IPCConnectionRef> SocketTransport::connectToEndpoint(const std::shared_ptr<IPCEndpoint>& endpoint) {
    const auto way = std::dynamic_pointer_cast<SocketEndpoint>(endpoint);
    if (!way) return KVError::posix(EINVAL, "endpoint");
    std::array<int, 2> ends{-1, -1};
    if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()) != 0)
        return KVError::posix(errno, "endpoint");
    UniqueFd own(ends[0]);
    const UniqueFd sent(ends[1]);
    if (const OptionalError error = way->sendConnection(sent.get())) return *error;
    return IPCConnectionRef(std::make_shared<SocketConnection>(SocketConnection::Side::client, std::move(own),
                                                               loop_, bundles_, root_, nullptr));
}

IPCConnectionRef SocketTransport::currentConnection() {
    return ConnectionBase::current();
}

}  // namespace kelvo
