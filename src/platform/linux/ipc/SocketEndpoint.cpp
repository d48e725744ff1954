#include "platform/linux/ipc/SocketEndpoint.h"

#include <cerrno>
#include <sys/socket.h>

namespace kelvo {

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

}  // namespace kelvo
