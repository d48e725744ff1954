#pragma once

#include "base/Guarded.h"
#include "ipc/KVClientProtocolTable.h"
#include "platform/IPC.h"
#include "support/FakeDaemon.h"

#include <memory>
#include <utility>

namespace kelvo::test {

/// Lets every client in to `daemon`, and remembers the last one.
class OpenDoor : public IPCListenerDelegate {
  public:
    explicit OpenDoor(std::shared_ptr<FakeDaemon> daemon = std::make_shared<FakeDaemon>())
        : daemon_(std::move(daemon)) {}

    bool listenerShouldAcceptNewConnection(IPCListener&, const IPCConnectionRef& connection) override {
        connection->setExported(interfaceOf<KVDaemonProtocol>(),
                                std::make_shared<ProtocolDispatcher<KVDaemonProtocol>>(daemon_));
        connection->setRemoteInterface(interfaceOf<KVClientProtocol>());
        connection->resume();
        client.set(connection);
        return true;
    }

    Guarded<IPCConnectionRef> client;

  private:
    const std::shared_ptr<FakeDaemon> daemon_;
};

}  // namespace kelvo::test
