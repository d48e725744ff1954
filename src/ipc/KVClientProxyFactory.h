#pragma once

#include "ipc/KVClientProxyBase.h"
#include "platform/IPC.h"

namespace kelvo {

/// Chooses how a client is called back. Thread-safe.
class KVClientProxyFactory {
  public:
    /// The shared multiple proxy, which then knows the connection, for a client that holds
    /// "com.quillon.private.kelvo-kit"; else a proxy of its own.
    static ClientProxyRef clientProxyWithNewConnection(const IPCConnectionRef& connection);
};

}  // namespace kelvo
