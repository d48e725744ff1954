#pragma once

#include "base/Guarded.h"
#include "ipc/KVAlertProtocols.h"
#include "platform/IPC.h"
#include "platform/SystemAlert.h"

#include <cstdint>
#include <map>
#include <memory>

namespace kelvo {

/// Shows alerts through the one shell process that has registered for it. With none an alert cannot be
/// created; when the shell goes, its alerts end as cancelled. Thread-safe.
class ShellAlerts : public SystemAlertService,
                    public IPCListenerDelegate,
                    public std::enable_shared_from_this<ShellAlerts> {
  public:
    /// Listens for shells at once.
    static std::shared_ptr<ShellAlerts> create(const std::shared_ptr<IPCTransport>& transport);

    Result<std::shared_ptr<SystemAlert>> createAlert(const SystemAlertContent& content) override;
    void close() override;

    bool listenerShouldAcceptNewConnection(IPCListener& listener,
                                           const IPCConnectionRef& connection) override;

  private:
    class Alert;
    class Link;
    using Identifier = std::int64_t;
    struct State {
        IPCConnectionRef shell;
        Identifier lastIdentifier = 0;
        std::map<Identifier, std::weak_ptr<Alert>> shown;
        bool isClosed = false;
    };

    explicit ShellAlerts(const std::shared_ptr<IPCTransport>& transport);
    OptionalError registerShell(const IPCConnectionRef& connection);
    void connectionEnded(const IPCConnectionRef& connection);
    void alertEnded(const IPCConnectionRef& connection, Identifier identifier, std::int32_t response);
    void forget(Identifier identifier);

    const std::shared_ptr<IPCTransport> transport_;
    const std::shared_ptr<IPCListener> listener_;
    Guarded<State> state_;
};

}  // namespace kelvo
