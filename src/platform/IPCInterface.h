#pragma once

#include "base/Value.h"
#include "base/VideoSurface.h"

#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace kelvo {

/// The kinds of object that an argument may carry by handle. Where none is allowed, a message that carries
/// one ends its connection.
enum class IPCObjects : std::uint8_t { none, surfaces, endpoints };

/// One argument of a request, or one value of its reply.
struct IPCArgument {
    std::string name;
    /// Its type as a D-Bus signature of one complete type. A structure travels in a `Value` as an array of
    /// its fields, `ay` as bytes, `a{sv}` as a dictionary. Two types stand for objects: `(huuuu)` is a
    /// `VideoSurface` and `h` an `IPCEndpoint`.
    std::string signature;
    IPCObjects allowedObjects = IPCObjects::none;
    /// What it says, in a sentence for whoever writes a client.
    std::string documentation = {};
};

/// One message of a protocol.
struct IPCMethod {
    std::string name;
    std::vector<IPCArgument> arguments;
    /// What the reply holds; without one the message is one-way.
    std::optional<std::vector<IPCArgument>> reply;
    std::string documentation = {};

    bool isOneWay() const { return !reply; }
};

/// The messages that one side of a connection understands. Immutable and shared once it is made.
struct IPCInterface {
    std::string name;
    std::vector<IPCMethod> methods;

    /// The place of a method in `methods`; none when there is none of that name.
    std::optional<std::size_t> indexOf(std::string_view methodName) const {
        for (std::size_t i = 0; i < methods.size(); ++i) {
            if (methods[i].name == methodName) return i;
        }
        return std::nullopt;
    }
};

/// The call of a one-way method that takes a surface and the bytes of a record about it, and nothing else. As
/// there are many of them, they may travel without becoming values. Only refers to what its maker has.
struct IPCFrame {
    std::size_t method;  ///< its place in the interface
    const VideoSurfaceRef& surface;
    std::span<const std::byte> record;
};

/// Sends the values of a reply. Once, from any thread; later calls do nothing. Dropped without a call, the
/// sender waits until its connection ends.
using IPCReply = std::function<void(Array values)>;

/// Serves the messages that arrive on a connection.
class IPCExportedObject {
  public:
    virtual ~IPCExportedObject() = default;

    /// Serves method number `method` of the exported interface, on the connection's queue. `reply` is empty
    /// when the message is one-way or its sender wants no reply. False when the arguments are not what the
    /// method takes: then nothing was done and the transport ends the connection.
    virtual bool serve(std::size_t method, const Array& arguments, IPCReply reply) = 0;
    /// The same for a frame. False also when its method, or the whole object, takes none.
    virtual bool serveFrame(const IPCFrame& frame) {
        static_cast<void>(frame);
        return false;
    }
};

}  // namespace kelvo
