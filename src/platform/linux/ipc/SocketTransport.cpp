#include "platform/linux/ipc/SocketTransport.h"

#include "platform/linux/ipc/SocketConnection.h"
#include "platform/linux/ipc/SocketListener.h"

#include <array>
#include <cerrno>
#include <sys/socket.h>
#include <sys/un.h>

namespace kelvo {

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
    if (!socket || ::connect(socket.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0)
        return KVError::posix(errno, hostPath);
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
