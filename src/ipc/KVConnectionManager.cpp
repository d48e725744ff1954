#include "ipc/KVConnectionManager.h"

#include "base/KVLog.h"

namespace kelvo {

std::shared_ptr<IPCConnection> KVConnectionManager::getCurrentConnection() const {
    if (auto connection = transport_->currentConnection()) return connection;
    return currentConnection_.copy().lock();
}

bool KVConnectionManager::listenerShouldAcceptNewConnection(
    IPCListener&, const std::shared_ptr<IPCConnection>& connection) {
    KVLogError("KVConnectionManager: turned away PID %d: no protocol is spoken yet",
               connection->processIdentifier());
    return false;
}

}  // namespace kelvo
