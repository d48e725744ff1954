#include "ipc/KVClientProxyFactory.h"

#include "ipc/KVClientProxy.h"
#include "ipc/KVMultipleClientProxy.h"

namespace kelvo {

ClientProxyRef KVClientProxyFactory::clientProxyWithNewConnection(const IPCConnectionRef& connection) {
    const Value entitlement = connection->valueForEntitlement("com.quillon.private.kelvo-kit");
    if (!entitlement.asBool().value_or(false)) return std::make_shared<KVClientProxy>(connection);
    const auto& shared = KVMultipleClientProxy::clientProxy();
    shared->handleNewConnection(connection);
    return shared;
}

}  // namespace kelvo
