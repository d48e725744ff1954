#pragma once

#include "base/UniqueFd.h"
#include "base/Value.h"
#include "platform/linux/ipc/DBusMessage.h"
#include "support/DescriptorPassing.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <span>
#include <string>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/un.h>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {

/// The bytes of one message, and what travelled beside them.
struct WireMessage {
    Bytes bytes;
    std::vector<UniqueFd> descriptors;

    /// Its texts are the bytes' own.
    dbus::Message parsed() const {
        std::uint32_t descriptorCount = 0;
        auto message = dbus::parse(bytes, descriptorCount);
        EXPECT_TRUE(message);
        return message ? std::move(*message) : dbus::Message();
    }
};

/// A peer without manners: the bare end of a stream socket, which reads and writes whatever it likes.
class RawSocket {
  public:
    explicit RawSocket(UniqueFd socket) : socket_(std::move(socket)) {
        const timeval patience{20, 0};
        ::setsockopt(socket_.get(), SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof(patience));
    }
    /// Connected to the socket at `path`.
    explicit RawSocket(const std::string& path)
        : RawSocket(UniqueFd(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0))) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        path.copy(address.sun_path, sizeof(address.sun_path) - 1);
        EXPECT_EQ(::connect(socket_.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
    }
    /// Connected to the other end, which is given back.
    static std::pair<RawSocket, UniqueFd> pair() {
        std::array<int, 2> ends{-1, -1};
        EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()), 0);
        return {RawSocket(UniqueFd(ends[0])), UniqueFd(ends[1])};
    }

    /// What a client says before its first message.
    void authenticate() {
        write(std::string(1, '\0') + "AUTH EXTERNAL\r\nDATA\r\nNEGOTIATE_UNIX_FD\r\nBEGIN\r\n");
    }
    void write(const std::string& text) {
        ASSERT_EQ(::send(socket_.get(), text.data(), text.size(), MSG_NOSIGNAL),
                  static_cast<ssize_t>(text.size()));
    }
    void write(const WireMessage& message) {
        std::vector<int> descriptors;
        for (const UniqueFd& each : message.descriptors)
            descriptors.push_back(each.get());
        write(message.bytes, descriptors);
    }
    void write(std::span<const std::byte> bytes, const std::vector<int>& descriptors = {}) {
        ASSERT_EQ(sendWithDescriptors(socket_.get(), bytes, descriptors), static_cast<ssize_t>(bytes.size()));
    }

    /// Reads until `end` has come.
    std::string readUntil(const std::string& end) {
        std::string text;
        while (!text.ends_with(end)) {
            char character = 0;
            if (::recv(socket_.get(), &character, 1, 0) != 1) {
                ADD_FAILURE() << "the other side ended within: " << text;
                break;
            }
            text += character;
        }
        return text;
    }
    /// The next message; empty when none comes.
    WireMessage read() {
        WireMessage message;
        if (!readBytes(message, dbus::kFixedHeader)) return {};
        const auto size = dbus::messageSize(message.bytes);
        EXPECT_TRUE(size) << size.error().description();
        if (!size || !readBytes(message, *size - dbus::kFixedHeader)) return {};
        return message;
    }

    /// Whether the other side has ended the connection, or does so now.
    bool isCutOff() {
        std::array<char, 4096> buffer;
        ssize_t count = 1;
        while (count > 0)
            count = ::recv(socket_.get(), buffer.data(), buffer.size(), 0);
        return count == 0 || errno == ECONNRESET;
    }
    int descriptor() const { return socket_.get(); }

  private:
    bool readBytes(WireMessage& message, std::size_t count) {
        while (count > 0) {
            std::array<std::byte, 4096> buffer;
            alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(int))> control{};
            iovec part{buffer.data(), std::min(count, buffer.size())};
            msghdr header{};
            header.msg_iov = &part;
            header.msg_iovlen = 1;
            header.msg_control = control.data();
            header.msg_controllen = control.size();
            const ssize_t received = ::recvmsg(socket_.get(), &header, MSG_CMSG_CLOEXEC);
            if (received <= 0) {
                ADD_FAILURE() << "no message came";
                return false;
            }
            if (const cmsghdr* item = CMSG_FIRSTHDR(&header)) {
                int descriptor = -1;
                std::memcpy(&descriptor, CMSG_DATA(item), sizeof(descriptor));
                message.descriptors.emplace_back(descriptor);
            }
            message.bytes.insert(message.bytes.end(), buffer.begin(), buffer.begin() + received);
            count -= static_cast<std::size_t>(received);
        }
        return true;
    }

    UniqueFd socket_;
};

}  // namespace kelvo::test
