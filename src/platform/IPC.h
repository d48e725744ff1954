#pragma once

#include "base/Value.h"

#include <cstdint>
#include <memory>
#include <string_view>

namespace kelvo {

/// One client process's connection. Thread-safe.
class IPCConnection {
  public:
    virtual ~IPCConnection() = default;
    virtual std::int32_t processIdentifier() const = 0;
    /// The value of a right that the peer's bundle holds; nothing when it holds none of that name.
    virtual Value valueForEntitlement(std::string_view name) const = 0;
};

class IPCListener;

/// Decides about new connections, on a thread of the transport.
class IPCListenerDelegate {
  public:
    virtual ~IPCListenerDelegate() = default;
    /// Whether the connection is kept.
    virtual bool listenerShouldAcceptNewConnection(IPCListener& listener,
                                                   const std::shared_ptr<IPCConnection>& connection) = 0;
};

/// Listens for clients on a named service, suspended until it is resumed.
class IPCListener {
  public:
    virtual ~IPCListener() = default;
    virtual void setDelegate(std::weak_ptr<IPCListenerDelegate> delegate) = 0;
    virtual void resume() = 0;
};

/// The inter-process transport. Implemented by a Linux adapter that no client can reach yet and by the
/// simulated device.
class IPCTransport {
  public:
    virtual ~IPCTransport() = default;
    virtual std::shared_ptr<IPCListener> createListener(std::string_view serviceName) = 0;
    /// The connection on which the request came that the calling thread serves now; none outside a request.
    virtual std::shared_ptr<IPCConnection> currentConnection() = 0;
};

}  // namespace kelvo
