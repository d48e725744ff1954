#pragma once

#include "base/Guarded.h"
#include "platform/IPC.h"

#include <memory>
#include <string>

namespace kelvo {

/// What the connection manager tells the recording manager, on a thread of the transport.
class KVConnectionManagerDelegate {
  public:
    virtual ~KVConnectionManagerDelegate() = default;
};

/// The daemon's door for client processes: the delegate of the public listener. Thread-safe.
///
/// No protocol is spoken yet, so every peer is turned away.
class KVConnectionManager : public IPCListenerDelegate {
  public:
    explicit KVConnectionManager(std::shared_ptr<IPCTransport> transport)
        : transport_(std::move(transport)) {}

    std::shared_ptr<KVConnectionManagerDelegate> delegate() const { return delegate_.copy().lock(); }
    /// Held weakly: the delegate owns this object.
    void setDelegate(std::weak_ptr<KVConnectionManagerDelegate> delegate) {
        delegate_.set(std::move(delegate));
    }

    /// The connection of the request that is served now; outside a request the one remembered, if it still
    /// lives.
    std::shared_ptr<IPCConnection> getCurrentConnection() const;
    /// Remembers, weakly, who sent the latest request.
    void setCurrentConnection(const std::shared_ptr<IPCConnection>& connection) {
        currentConnection_.set(connection);
    }

    bool listenerShouldAcceptNewConnection(IPCListener& listener,
                                           const std::shared_ptr<IPCConnection>& connection) override;

  private:
    const std::shared_ptr<IPCTransport> transport_;
    Guarded<std::weak_ptr<KVConnectionManagerDelegate>> delegate_;
    Guarded<std::weak_ptr<IPCConnection>> currentConnection_;
};

}  // namespace kelvo
