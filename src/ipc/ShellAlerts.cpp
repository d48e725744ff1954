#include "ipc/ShellAlerts.h"

#include "base/KVLog.h"
#include "platform/PendingAlert.h"

#include <cerrno>
#include <utility>

namespace kelvo {
namespace {

constexpr std::string_view kShellEntitlement = "com.quillon.private.kelvo-kit";

}  // namespace

/// Goes from the screen when nobody holds it any more.
class ShellAlerts::Alert : public PendingAlert {
  public:
    Alert(std::weak_ptr<ShellAlerts> service, IPCConnectionRef shell, Identifier identifier)
        : service_(std::move(service)), shell_(std::move(shell)), identifier_(identifier) {}
    ~Alert() override {
        withdraw();
        if (const auto service = service_.lock()) service->forget(identifier_);
    }
    Alert(const Alert&) = delete;
    Alert& operator=(const Alert&) = delete;

    void cancel() override { withdraw(); }

    void show(const SystemAlertContent& content, const std::weak_ptr<Alert>& self) const {
        // A shell that cannot be told goes, and takes the alert with it; this is for one that went before.
        RemoteAlertShell(*shell_,
                         [self](const KVError&) {
                             if (const auto alert = self.lock())
                                 alert->answer(SystemAlertResponse::cancelled);
                         })
            .showAlert(identifier_, content.header, content.message, content.defaultButton,
                       content.alternateButton, content.otherButton);
    }

  private:
    void withdraw() {
        if (answer(SystemAlertResponse::cancelled))
            RemoteAlertShell(*shell_, nullptr).cancelAlert(identifier_);
    }

    const std::weak_ptr<ShellAlerts> service_;
    const IPCConnectionRef shell_;
    const Identifier identifier_;
};

/// What one connection may ask.
class ShellAlerts::Link : public KVAlertServiceProtocol {
  public:
    Link(std::weak_ptr<ShellAlerts> service, std::weak_ptr<IPCConnection> connection)
        : service_(std::move(service)), connection_(std::move(connection)) {}

    void registerAlertShell(ErrorHandler handler) override {
        const auto service = service_.lock();
        const auto connection = connection_.lock();
        if (!service || !connection) return;
        const OptionalError error = service->registerShell(connection);
        if (handler) handler(error);
    }
    void alertDidEnd(std::int64_t identifier, std::int32_t response) override {
        const auto service = service_.lock();
        const auto connection = connection_.lock();
        if (service && connection) service->alertEnded(connection, identifier, response);
    }

  private:
    const std::weak_ptr<ShellAlerts> service_;
    const std::weak_ptr<IPCConnection> connection_;
};

std::shared_ptr<ShellAlerts> ShellAlerts::create(const std::shared_ptr<IPCTransport>& transport) {
    std::shared_ptr<ShellAlerts> service(new ShellAlerts(transport));
    service->listener_->setDelegate(service);
    service->listener_->resume();
    return service;
}

ShellAlerts::ShellAlerts(const std::shared_ptr<IPCTransport>& transport)
    : transport_(transport), listener_(transport->createListener(kAlertServiceName)) {}

bool ShellAlerts::listenerShouldAcceptNewConnection(IPCListener&, const IPCConnectionRef& connection) {
    const auto link = std::make_shared<Link>(weak_from_this(), connection);
    connection->setExported(interfaceOf<KVAlertServiceProtocol>(),
                            std::make_shared<ProtocolDispatcher<KVAlertServiceProtocol>>(link));
    connection->setRemoteInterface(interfaceOf<KVAlertShellProtocol>());
    // Holds the link for as long as the connection lives.
    connection->setInvalidationHandler(
        [link, weakService = weak_from_this(), weakConnection = std::weak_ptr(connection)] {
            const auto service = weakService.lock();
            const auto ended = weakConnection.lock();
            if (service && ended) service->connectionEnded(ended);
        });
    connection->resume();
    return true;
}

OptionalError ShellAlerts::registerShell(const IPCConnectionRef& connection) {
    // Looked up outside of the lock: it reads files.
    if (!holdsEntitlement(*connection, kShellEntitlement)) return KVError::posix(EPERM, "alert shell");
    const bool isRegistered = state_.with([&](State& state) {
        if (!state.shell) state.shell = connection;
        return state.shell == connection;
    });
    if (!isRegistered) return KVError::posix(EBUSY, "alert shell");
    KVLog("alerts are shown by PID: %d", connection->processIdentifier());
    return std::nullopt;
}

void ShellAlerts::connectionEnded(const IPCConnectionRef& connection) {
    const auto ended = state_.with([&](State& state) {
        if (state.shell != connection) return decltype(state.shown)();
        state.shell.reset();
        return std::exchange(state.shown, {});
    });
    for (const auto& [identifier, weakAlert] : ended) {
        if (const auto alert = weakAlert.lock()) alert->answer(SystemAlertResponse::cancelled);
    }
}

void ShellAlerts::alertEnded(const IPCConnectionRef& connection, Identifier identifier,
                             std::int32_t response) {
    const auto alert = state_.with([&](State& state) {
        const auto found = state.shell == connection ? state.shown.find(identifier) : state.shown.end();
        return found != state.shown.end() ? found->second.lock() : nullptr;
    });
    const bool isButton = response >= 0 && response < static_cast<int>(SystemAlertResponse::cancelled);
    if (alert)
        alert->answer(isButton ? static_cast<SystemAlertResponse>(response) : SystemAlertResponse::cancelled);
}

void ShellAlerts::forget(Identifier identifier) {
    state_.with([&](State& state) { state.shown.erase(identifier); });
}

void ShellAlerts::close() {
    const auto shown = state_.with([](State& state) {
        state.isClosed = true;
        return state.shown;
    });
    for (const auto& [identifier, weakAlert] : shown) {
        if (const auto alert = weakAlert.lock()) alert->cancel();
    }
}

Result<std::shared_ptr<SystemAlert>> ShellAlerts::createAlert(const SystemAlertContent& content) {
    const auto alert = state_.with([&](State& state) {
        if (!state.shell || state.isClosed) return std::shared_ptr<Alert>();
        const Identifier identifier = ++state.lastIdentifier;
        auto created = std::make_shared<Alert>(weak_from_this(), state.shell, identifier);
        state.shown.emplace(identifier, created);
        return created;
    });
    if (!alert) return KVError::posix(ENOTCONN, "no system shell shows alerts");
    alert->show(content, alert);
    return std::shared_ptr<SystemAlert>(alert);
}

}  // namespace kelvo
