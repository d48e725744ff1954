#pragma once

#include "base/UniqueFd.h"
#include "base/Value.h"
#include "platform/linux/ipc/DBusMessage.h"
#include "support/DescriptorPassing.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <string>
#include <sys/socket.h>
#include <sys/time.h>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {

/// The bytes of one message, and what travelled beside them.
struct WireMessage {
    Bytes bytes;
    std::vector<UniqueFd> descriptors;
};

/// The bare end of a stream socket whose other end a connection has: reads and writes what stands on the
/// wire.
class RawEnd {
  public:
    RawEnd() {
        std::array<int, 2> ends{-1, -1};
        EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()), 0);
        own_ = UniqueFd(ends[0]);
        other_ = UniqueFd(ends[1]);
        const timeval patience{20, 0};
        ::setsockopt(own_.get(), SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof(patience));
    }

    /// The end for the connection, once.
    UniqueFd takeOther() { return std::move(other_); }

    void write(const std::string& text) {
        ASSERT_EQ(::send(own_.get(), text.data(), text.size(), MSG_NOSIGNAL),
                  static_cast<ssize_t>(text.size()));
    }
    void write(const WireMessage& message) {
        std::vector<int> descriptors;
        for (const UniqueFd& each : message.descriptors)
            descriptors.push_back(each.get());
        ASSERT_EQ(sendWithDescriptors(own_.get(), message.bytes, descriptors),
                  static_cast<ssize_t>(message.bytes.size()));
    }

    /// Reads until `end` has come.
    std::string readUntil(const std::string& end) {
        std::string text;
        while (!text.ends_with(end)) {
            char character = 0;
            if (::recv(own_.get(), &character, 1, 0) != 1) {
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
            const ssize_t received = ::recvmsg(own_.get(), &header, MSG_CMSG_CLOEXEC);
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

    UniqueFd own_;
    UniqueFd other_;
};

}  // namespace kelvo::test
