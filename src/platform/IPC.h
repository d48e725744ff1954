#pragma once

#include "base/KVError.h"
#include "base/Result.h"
#include "base/URL.h"
#include "base/Value.h"
#include "platform/IPCInterface.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string_view>

namespace kelvo {

/// The way to an anonymous listener: whoever holds it can connect, nobody else can. Travels in messages.
/// Thread-safe.
class IPCEndpoint : public ObjectHandle {};

/// The other side of a connection, as something to send messages to. Thread-safe; never waits for the peer.
class IPCRemoteObject {
  public:
    virtual ~IPCRemoteObject() = default;

    /// Sends method number `method` of the remote interface. Messages of one connection arrive in the order
    /// in which they were sent. `replyHandler` (may be empty) gets the reply's values, on the connection's
    /// queue, and is dropped when the connection ends first: then the error handler runs instead.
    ///
    /// Surfaces in a one-way message are lent: one reference to each is held until the peer has dropped its
    /// last one, or the connection has ended, so a pool does not overwrite what a peer still reads. A peer
    /// that holds too many is sent no further one; that delivery fails with EAGAIN.
    virtual void send(std::size_t method, Array arguments, IPCReply replyHandler) = 0;
};

/// One end of a link between two processes. Begins suspended: set up, then `resume`. Thread-safe.
///
/// Messages from the peer, replies and the two handlers run one at a time on the connection's own queue, in
/// the order of their arrival. A connection ends once, in one of two ways:
///
///   interruption   the peer was lost unexpectedly: its process ended or it closed its end, without this side
///                  having asked for that
///   invalidation   the connection is over: nothing is received or sent any more
///
/// A lost peer runs both handlers, the interruption's first; `invalidate`, and a peer that is cut off because
/// it breaks the protocol or a bound, run the invalidation's alone. Each runs at most once, and both are
/// dropped afterwards.
class IPCConnection {
  public:
    virtual ~IPCConnection() = default;

    /// The peer's process, as the system saw it when the connection was made.
    virtual std::int32_t processIdentifier() const = 0;
    /// The value of a right that the peer's bundle holds, looked up now; nothing when it holds none of that
    /// name.
    virtual Value valueForEntitlement(std::string_view name) const = 0;

    /// A file of this device as the peer finds it, and the other way round. Other URLs stay as they are.
    virtual URL urlForPeer(const URL& url) const = 0;
    virtual URL urlFromPeer(const URL& url) const = 0;

    /// What the peer may send, and who serves it. Before `resume`.
    virtual void setExported(std::shared_ptr<const IPCInterface> interface,
                             std::shared_ptr<IPCExportedObject> object) = 0;
    /// What may be sent to the peer. Before the first remote object is asked for.
    virtual void setRemoteInterface(std::shared_ptr<const IPCInterface> interface) = 0;

    /// Replace the handlers; an empty one removes.
    virtual void setInterruptionHandler(std::function<void()> handler) = 0;
    virtual void setInvalidationHandler(std::function<void()> handler) = 0;

    /// Hands a frame to the peer at a fraction of what a message costs, if the transport can do that by now:
    /// in order with the messages, and with its surface lent as theirs are. False when nothing was done; then
    /// it is to be sent as a message. `frame.method` is one of the remote interface's. Never waits for the
    /// peer.
    virtual bool handOver(const IPCFrame& frame) = 0;

    /// Starts receiving.
    virtual void resume() = 0;
    /// Ends the connection; what was sent before still goes out as far as the peer takes it at once.
    virtual void invalidate() = 0;

    /// The peer. `errorHandler` (may be empty) runs once for each message that was not handed to the system
    /// as a whole before the connection's end, and for each reply that can no longer come: at once on the
    /// sender's thread when that is known by then, else on the connection's queue. What the system took may
    /// still be lost with a peer that does not read it; nothing tells. The error has the domain
    /// `kPOSIXErrorDomain`.
    virtual std::shared_ptr<IPCRemoteObject> remoteObjectProxyWithErrorHandler(
        std::function<void(const KVError&)> errorHandler) = 0;
};

using IPCConnectionRef = std::shared_ptr<IPCConnection>;

/// Whether the peer holds a right that is granted or not. Only a boolean grants it; a right of that name with
/// a number or a text was meant for something else.
inline bool holdsEntitlement(const IPCConnection& connection, std::string_view name) {
    const Value value = connection.valueForEntitlement(name);
    const bool* isGranted = value.as<bool>();
    return isGranted != nullptr && *isGranted;
}

inline std::optional<URL> urlForPeer(const IPCConnection& connection, const std::optional<URL>& url) {
    return url ? std::optional(connection.urlForPeer(*url)) : std::nullopt;
}

class IPCListener;

/// Decides about new connections, on a thread of the transport.
class IPCListenerDelegate {
  public:
    virtual ~IPCListenerDelegate() = default;
    /// Whether the connection is kept; it is the delegate that sets it up and resumes it.
    virtual bool listenerShouldAcceptNewConnection(IPCListener& listener,
                                                   const IPCConnectionRef& connection) = 0;
};

/// Listens for peers, suspended until it is resumed; ends when it goes. The connections that it accepted stay
/// and are kept alive by the transport until they end. Thread-safe.
class IPCListener {
  public:
    virtual ~IPCListener() = default;
    virtual void setDelegate(std::weak_ptr<IPCListenerDelegate> delegate) = 0;
    /// Accepts from now on. A service name that cannot be taken is logged, and nobody will connect.
    virtual void resume() = 0;
    /// The way to this listener, to be sent to another process. None for a named one.
    virtual std::shared_ptr<IPCEndpoint> endpoint() const = 0;
};

/// The inter-process transport. Implemented by D-Bus over Unix sockets and by the simulated device, both of
/// which keep the same contract test. Thread-safe.
class IPCTransport {
  public:
    virtual ~IPCTransport() = default;

    /// A listener that processes reach by name.
    virtual std::shared_ptr<IPCListener> createListener(std::string_view serviceName) = 0;
    /// A listener that only holders of its endpoint reach. Fails when descriptors run out.
    virtual Result<std::shared_ptr<IPCListener>> createAnonymousListener() = 0;

    /// Connections to listeners, begun suspended. They fail when nobody listens there; whether the listener
    /// accepts shows only later.
    virtual Result<IPCConnectionRef> connectToService(std::string_view serviceName) = 0;
    virtual Result<IPCConnectionRef> connectToEndpoint(const std::shared_ptr<IPCEndpoint>& endpoint) = 0;

    /// The connection on which the request came that the calling thread serves now; none outside a request.
    virtual IPCConnectionRef currentConnection() = 0;
};

}  // namespace kelvo
