#pragma once

#include "base/Result.h"
#include "base/UniqueFd.h"
#include "base/Value.h"
#include "base/VideoSurface.h"

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <span>
#include <string_view>
#include <vector>

namespace kelvo::dbus {

enum class MessageType : std::uint8_t { call = 1, reply = 2, error = 3, signal = 4 };

/// A descriptor that goes with a message. It is the owner's, and open for as long as that is held.
struct SentDescriptor {
    std::shared_ptr<const ObjectHandle> owner;
    int descriptor = -1;
};

/// One D-Bus message. Little endian on the wire, as all peers of this machine write. Its texts are views: of
/// the bytes that it was parsed from, or of whatever its maker keeps for as long as the message is used.
struct Message {
    static constexpr std::uint8_t kNoReplyExpected = 1;

    MessageType type = MessageType::call;
    std::uint8_t flags = 0;
    std::uint32_t serial = 0;
    std::uint32_t replySerial = 0;  ///< 0: none
    std::string_view path;
    std::string_view interface;
    std::string_view member;
    std::string_view errorName;
    std::string_view signature;
    Bytes body;
    std::vector<UniqueFd> descriptors;            ///< that came with it
    std::vector<SentDescriptor> sentDescriptors;  ///< that go with it

    /// A reply or an error, without its content, to the message with this serial.
    static Message replying(MessageType type, std::uint32_t serial) {
        Message reply;
        reply.type = type;
        reply.flags = kNoReplyExpected;
        reply.replySerial = serial;
        return reply;
    }

    bool wantsReply() const { return type == MessageType::call && (flags & kNoReplyExpected) == 0; }
};

/// The serial of the next message; 0 is none.
inline std::uint32_t serialAfter(std::uint32_t serial) {
    return serial + 1 == 0 ? 1 : serial + 1;
}

/// Bytes that a message's size can be read from.
inline constexpr std::size_t kFixedHeader = 16;

/// The bytes of the message whose first `kFixedHeader` bytes these are. Fails when it is no message, or
/// larger than the bounds.
Result<std::size_t> messageSize(std::span<const std::byte> head);

/// Exactly one message, without its descriptors; `descriptorCount` says how many it claims. Its texts stay
/// where `bytes` are. Fails on anything that is not well-formed.
Result<Message> parse(std::span<const std::byte> bytes, std::uint32_t& descriptorCount);

/// The bytes that are sent for a message; its descriptors go beside them.
Bytes serialize(const Message& message);

/// Appends `values`, one for each complete type of `signature`. Fails when one does not fit its type, which
/// is a bug of the sender. Objects add to `sentDescriptors`.
OptionalError writeBody(const Array& values, Message& message);

/// Makes a surface of what a message says about it, as `VideoSurface::fromDescriptor` does.
using OpenSurface =
    std::function<Result<VideoSurfaceRef>(UniqueFd descriptor, const VideoSurface::Geometry& geometry)>;

/// The values of a message's body. `objectsAllowed` says whether descriptors may stand in it. Fails on
/// anything that is not well-formed, and on a descriptor that is not what its type says.
Result<Array> readBody(Message& message, bool objectsAllowed,
                       const OpenSurface& openSurface = VideoSurface::fromDescriptor);

}  // namespace kelvo::dbus
