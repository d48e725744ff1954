#include "platform/linux/ipc/SocketEndpoint.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <sys/socket.h>
#include <vector>

namespace kelvo {
namespace {

bool isStreamSocket(int descriptor) {
    int domain = -1;
    int type = -1;
    socklen_t size = sizeof(int);
    return ::getsockopt(descriptor, SOL_SOCKET, SO_DOMAIN, &domain, &size) == 0 && domain == AF_UNIX &&
           ::getsockopt(descriptor, SOL_SOCKET, SO_TYPE, &type, &size) == 0 && type == SOCK_STREAM;
}

}  // namespace

Result<std::shared_ptr<SocketEndpoint>> SocketEndpoint::fromDescriptor(UniqueFd descriptor) {
    const auto option = [&](int name) {
        int value = -1;
        socklen_t size = sizeof(value);
        return ::getsockopt(descriptor.get(), SOL_SOCKET, name, &value, &size) == 0 ? value : -1;
    };
    if (option(SO_DOMAIN) != AF_UNIX || option(SO_TYPE) != SOCK_SEQPACKET)
        return KVError::posix(EINVAL, "endpoint descriptor");
    return std::make_shared<SocketEndpoint>(std::move(descriptor));
}

OptionalError SocketEndpoint::sendConnection(int connection) const {
    std::byte byte{};
    alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(int))> control{};
    iovec part{&byte, 1};
    msghdr header{};
    header.msg_iov = &part;
    header.msg_iovlen = 1;
    header.msg_control = control.data();
    header.msg_controllen = control.size();
    cmsghdr* item = CMSG_FIRSTHDR(&header);
    item->cmsg_level = SOL_SOCKET;
    item->cmsg_type = SCM_RIGHTS;
    item->cmsg_len = CMSG_LEN(sizeof(int));
    std::memcpy(CMSG_DATA(item), &connection, sizeof(connection));
    if (::sendmsg(descriptor(), &header, MSG_NOSIGNAL | MSG_DONTWAIT) == 1) return std::nullopt;
    return KVError::posix(errno, "endpoint");
}

UniqueFd SocketEndpoint::receiveConnection(int listener, bool& isAtEnd) {
    std::byte byte{};
    alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(int))> control;
    iovec part{&byte, 1};
    msghdr header{};
    header.msg_iov = &part;
    header.msg_iovlen = 1;
    header.msg_control = control.data();
    header.msg_controllen = control.size();
    const ssize_t count = ::recvmsg(listener, &header, MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
    isAtEnd = count <= 0;
    const cmsghdr* item = isAtEnd ? nullptr : CMSG_FIRSTHDR(&header);
    if (item == nullptr || item->cmsg_level != SOL_SOCKET || item->cmsg_type != SCM_RIGHTS) return UniqueFd();
    // Alignment leaves room for a second one, which a hostile packet fills: owned, so that it is closed.
    std::vector<UniqueFd> received;
    for (std::size_t place = CMSG_LEN(0); place + sizeof(int) <= item->cmsg_len; place += sizeof(int)) {
        int descriptor = -1;
        std::memcpy(&descriptor, reinterpret_cast<const char*>(item) + place, sizeof(descriptor));
        received.emplace_back(descriptor);
    }
    const bool isConnection = received.size() == 1 && isStreamSocket(received.front().get());
    return isConnection ? std::move(received.front()) : UniqueFd();
}

}  // namespace kelvo
