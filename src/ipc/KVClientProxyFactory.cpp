#include "ipc/KVClientProxyFactory.h"

#include "ipc/KVClientProxy.h"
#include "ipc/KVMultipleClientProxy.h"

namespace kelvo {

ClientProxyRef KVClientProxyFactory::clientProxyWithNewConnection(const IPCConnectionRef& connection) {
    if (!holdsEntitlement(*connection, "com.quillon.private.kelvo-kit"))
        return std::make_shared<KVClientProxy>(connection);
    const auto& shared = KVMultipleClientProxy::clientProxy();
    shared->handleNewConnection(connection);
    return shared;
}

}  // namespace kelvo
