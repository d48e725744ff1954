#pragma once

#include "base/Value.h"
#include "platform/linux/ipc/DBusMessage.h"

#include <cstdint>
#include <string>
#include <string_view>
#include <utility>

#include <gtest/gtest.h>

namespace kelvo::test {

/// Builds arguments byte by byte, right or wrong.
class BodyBytes {
  public:
    BodyBytes& u32(std::uint32_t number) {
        align(4);
        for (int shift = 0; shift < 32; shift += 8)
            bytes_.push_back(static_cast<std::byte>(number >> shift));
        return *this;
    }
    BodyBytes& raw(std::string_view text) {
        for (const char character : text)
            bytes_.push_back(static_cast<std::byte>(character));
        return *this;
    }
    BodyBytes& string(std::string_view text) {
        u32(static_cast<std::uint32_t>(text.size()));
        return raw(text).raw({"\0", 1});
    }
    BodyBytes& align(std::size_t boundary) {
        while (bytes_.size() % boundary != 0)
            bytes_.push_back(std::byte{0});
        return *this;
    }
    /// A dictionary of the one entry "k", whose variant's bytes are these.
    BodyBytes& dictionaryWith(std::string_view variant) {
        const std::size_t size = 4 + 2 + variant.size();
        return u32(static_cast<std::uint32_t>(size)).align(8).string("k").raw(variant);
    }
    Bytes bytes() const { return bytes_; }

  private:
    Bytes bytes_;
};

/// A call of one of our interfaces, which wants no reply, with whatever arguments.
inline Bytes wireCall(const std::string& interface, const std::string& member, const std::string& signature,
                      Bytes body, std::uint32_t descriptorsClaimed = 0) {
    dbus::Message message;
    message.serial = 1;
    message.flags = dbus::Message::kNoReplyExpected;
    message.path = "/com/quillon/kelvod";
    message.interface = interface;
    message.member = member;
    message.signature = signature;
    message.body = std::move(body);
    message.sentDescriptors.resize(descriptorsClaimed);
    return dbus::serialize(message);
}

inline Bytes requestBytes(const std::string& member, const std::string& signature, Bytes body,
                          std::uint32_t descriptorsClaimed = 0) {
    return wireCall("com.quillon.KelvoKit.KVDaemonProtocol", member, signature, std::move(body),
                    descriptorsClaimed);
}

/// The bytes of arguments that do fit.
inline Bytes argumentBytes(const std::string& signature, const Array& values) {
    dbus::Message message;
    message.signature = signature;
    EXPECT_FALSE(dbus::writeBody(values, message));
    return message.body;
}

}  // namespace kelvo::test
