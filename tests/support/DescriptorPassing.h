#pragma once

#include "base/UniqueFd.h"

#include <array>
#include <cstddef>
#include <cstring>
#include <span>
#include <sys/socket.h>

namespace kelvo::test {

/// Sends bytes with up to eight descriptors beside them; what `sendmsg` says.
inline ssize_t sendWithDescriptors(int socket, std::span<const std::byte> bytes,
                                   std::span<const int> descriptors) {
    alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(int) * 8)> control{};
    iovec part{const_cast<std::byte*>(bytes.data()), bytes.size()};
    msghdr header{};
    header.msg_iov = &part;
    header.msg_iovlen = 1;
    if (!descriptors.empty()) {
        header.msg_control = control.data();
        header.msg_controllen = CMSG_SPACE(descriptors.size_bytes());
        cmsghdr* item = CMSG_FIRSTHDR(&header);
        item->cmsg_level = SOL_SOCKET;
        item->cmsg_type = SCM_RIGHTS;
        item->cmsg_len = CMSG_LEN(descriptors.size_bytes());
        std::memcpy(CMSG_DATA(item), descriptors.data(), descriptors.size_bytes());
    }
    return ::sendmsg(socket, &header, MSG_NOSIGNAL);
}

inline bool sendDescriptor(int socket, int descriptor) {
    const std::byte byte{};
    return sendWithDescriptors(socket, {&byte, 1}, {&descriptor, 1}) == 1;
}

/// The descriptor beside the next byte; none when there is none.
inline UniqueFd receiveDescriptor(int socket) {
    std::byte byte{};
    alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(int))> control{};
    iovec part{&byte, 1};
    msghdr header{};
    header.msg_iov = &part;
    header.msg_iovlen = 1;
    header.msg_control = control.data();
    header.msg_controllen = control.size();
    if (::recvmsg(socket, &header, MSG_CMSG_CLOEXEC) != 1) return UniqueFd();
    const cmsghdr* item = CMSG_FIRSTHDR(&header);
    if (item == nullptr || item->cmsg_type != SCM_RIGHTS) return UniqueFd();
    int descriptor = -1;
    std::memcpy(&descriptor, CMSG_DATA(item), sizeof(descriptor));
    return UniqueFd(descriptor);
}

}  // namespace kelvo::test
