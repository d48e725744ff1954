#include "ipc/KVConnectionManager.h"

#include "base/KVLog.h"
#include "ipc/KVClientProtocolTable.h"
#include "ipc/KVMultipleClientProxy.h"

namespace kelvo {
namespace {

/// The system's broadcast picker comes and goes as the user looks at it, and starts nothing itself.
constexpr std::string_view kBroadcastPickerBundleID =
    "com.quillon.KelvoKit.KVBroadcastActivityViewControllerExtension";

}  // namespace

SerialQueue& KVConnectionManager::connectionManagerQueue() {
    static SerialQueue queue("com.kelvokit.connectionManagerQueue");
    return queue;
}

IPCConnectionRef KVConnectionManager::getCurrentConnection() const {
    if (auto connection = transport_->currentConnection()) return connection;
    return currentConnection_.copy().lock();
}

void KVConnectionManager::setCurrentConnection(const IPCConnectionRef& connection) {
    currentConnection_.set(connection);
    KVMultipleClientProxy::clientProxy()->setCurrentConnectionProcessIdentifier(
        connection ? connection->processIdentifier() : 0);
}

bool KVConnectionManager::listenerShouldAcceptNewConnection(IPCListener&,
                                                            const IPCConnectionRef& connection) {
    // The text names the recording manager although the work is done here; readers of logs know it so.
    KVLog("KVRecordingManager: shouldAcceptNewConnection:");
    const std::int32_t processIdentifier = connection->processIdentifier();
    const BundleRef bundle = localization_->bundleWithPID(processIdentifier);
    std::optional<std::string> bundleIdentifier;
    if (bundle && !bundle->bundleIdentifier().empty()) bundleIdentifier = bundle->bundleIdentifier();
    KVLog("accepted client connection PID: %d", processIdentifier);
    connection->setExported(interfaceOf<KVDaemonProtocol>(),
                            std::make_shared<ProtocolDispatcher<KVDaemonProtocol>>(weak_from_this()));
    connection->setRemoteInterface(interfaceOf<KVClientProtocol>());
    if (bundleIdentifier != kBroadcastPickerBundleID) {
        installHandlers(*connection, bundleIdentifier);
        if (const auto owner = delegate())
            owner->connectionManagerDidAcceptNewConnection(connection, bundleIdentifier);
    }
    connection->resume();
    return true;
}

void KVConnectionManager::installHandlers(IPCConnection& connection,
                                          const std::optional<std::string>& bundleIdentifier) const {
    const auto tellDelegate = [weakDelegate = delegate_.copy(), bundleIdentifier,
                               processIdentifier = connection.processIdentifier()] {
        if (const auto owner = weakDelegate.lock())
            owner->applicationDisconnectedWithBundleID(bundleIdentifier, processIdentifier);
    };
    connection.setInterruptionHandler([tellDelegate] {
        KVLog("connection INTERRUPTED");
        tellDelegate();
    });
    connection.setInvalidationHandler([tellDelegate] {
        KVLog("connection INVALID");
        tellDelegate();
    });
}

}  // namespace kelvo
