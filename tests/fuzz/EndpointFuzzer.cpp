#include "../support/DescriptorPassing.h"
#include "base/KVError.h"
#include "platform/linux/ipc/DBusMessage.h"
#include "platform/linux/ipc/SocketEndpoint.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <fcntl.h>
#include <span>
#include <sys/mman.h>
#include <sys/socket.h>
#include <unistd.h>

namespace {

using kelvo::UniqueFd;

/// One of each kind of descriptor that a peer may try.
const UniqueFd& descriptorOfKind(unsigned kind) {
    static const std::array<UniqueFd, 6> kinds = [] {
        UniqueFd sealed(::memfd_create("sealed", MFD_CLOEXEC | MFD_ALLOW_SEALING));
        if (::ftruncate(sealed.get(), 4096) != 0) std::abort();
        ::fcntl(sealed.get(), F_ADD_SEALS, F_SEAL_SHRINK);
        return std::array<UniqueFd, 6>{UniqueFd(::socket(AF_UNIX, SOCK_SEQPACKET, 0)),
                                       UniqueFd(::socket(AF_UNIX, SOCK_STREAM, 0)),
                                       std::move(sealed),
                                       UniqueFd(::memfd_create("open", MFD_CLOEXEC)),
                                       UniqueFd(::open("/dev/null", O_RDONLY)),
                                       UniqueFd(::socket(AF_UNIX, SOCK_DGRAM, 0))};
    }();
    return kinds[kind % kinds.size()];
}

int lowestFreeDescriptor() {
    const UniqueFd next(::fcntl(0, F_DUPFD, 0));
    return next.get();
}

/// A message with descriptors beside it: objects or an error.
void readMessage(std::span<const std::byte> bytes, unsigned kinds, unsigned count) {
    std::uint32_t claimed = 0;
    auto message = kelvo::dbus::parse(bytes, claimed);
    if (!message) return;
    for (unsigned i = 0; i < count; ++i)
        message->descriptors.emplace_back(
            ::fcntl(descriptorOfKind(kinds >> (2 * i)).get(), F_DUPFD_CLOEXEC, 0));
    static_cast<void>(kelvo::dbus::readBody(*message, true));
}

/// The same as a packet to an anonymous listener: a connection, which is a stream socket, or nothing.
void receivePacket(std::span<const std::byte> bytes, unsigned kinds, unsigned count) {
    std::array<int, 2> ends{-1, -1};
    if (::socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends.data()) != 0) std::abort();
    const UniqueFd listener(ends[0]);
    const UniqueFd endpoint(ends[1]);
    std::array<int, 4> descriptors{};
    for (unsigned i = 0; i < count; ++i)
        descriptors[i] = descriptorOfKind(kinds >> (2 * i)).get();
    kelvo::test::sendWithDescriptors(endpoint.get(), bytes.first(std::min<std::size_t>(bytes.size(), 4096)),
                                     std::span(descriptors).first(count));
    bool isAtEnd = false;
    const UniqueFd connection = kelvo::SocketEndpoint::receiveConnection(listener.get(), isAtEnd);
    int type = 0;
    socklen_t size = sizeof(type);
    const bool isStream = connection &&
                          ::getsockopt(connection.get(), SOL_SOCKET, SO_TYPE, &type, &size) == 0 &&
                          type == SOCK_STREAM;
    if (connection && (!isStream || count != 1 || isAtEnd)) std::abort();
}

}  // namespace

/// The first two bytes say which descriptors there are, the rest are the message. Whatever comes, no
/// descriptor is left behind.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    if (size < 2) return 0;
    const unsigned kinds = data[0];
    const unsigned count = data[1] % 5;
    const auto bytes = std::as_bytes(std::span(data, size)).subspan(2);
    descriptorOfKind(0);
    const int free = lowestFreeDescriptor();
    readMessage(bytes, kinds, count);
    receivePacket(bytes, kinds, count);
    if (lowestFreeDescriptor() != free) std::abort();
    return 0;
}
