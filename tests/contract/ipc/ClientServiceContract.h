#pragma once

#include "IPCWorlds.h"
#include "ipc/KVClientProtocolTable.h"
#include "ipc/KVConnectionManager.h"
#include "ipc/KVMultipleClientProxy.h"
#include "ipc/KVRemoteDaemon.h"
#include "support/FakeClientProxy.h"
#include "support/FakeDaemon.h"
#include "support/LogRecorder.h"

#include <atomic>
#include <memory>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::test {

inline constexpr const char* kClientService = "com.quillon.kelvod";
inline constexpr const char* kPicker = "com.quillon.KelvoKit.KVBroadcastActivityViewControllerExtension";
inline constexpr const char* kSystemRight = "com.quillon.private.kelvo-kit";
inline constexpr const char* kSetupRight = "com.quillon.private.kelvo-kit.can-setup-broadcast";
inline const ClientProgram kPrivileged{"com.quillon.plinth", {{kSystemRight, true}}};
inline const ClientProgram kOrdinary{"com.example.app", {}};

/// Remembers the daemon's ends of what the connection manager accepted.
class RememberingGate : public IPCListenerDelegate {
  public:
    explicit RememberingGate(std::shared_ptr<KVConnectionManager> manager) : manager_(std::move(manager)) {}
    bool listenerShouldAcceptNewConnection(IPCListener& listener,
                                           const IPCConnectionRef& connection) override {
        const bool isKept = manager_->listenerShouldAcceptNewConnection(listener, connection);
        accepted.with([&](auto& all) { all.push_back(connection); });
        return isKept;
    }
    Guarded<std::vector<IPCConnectionRef>> accepted;

  private:
    const std::shared_ptr<KVConnectionManager> manager_;
};

/// The connection manager before a fake daemon, with clients that are processes of their own.
template <typename World>
class ClientServiceContract : public testing::Test {
  protected:
    struct Client {
        std::int32_t processIdentifier = 0;
        IPCConnectionRef connection;
        IPCConnectionRef daemonsEnd;
        std::shared_ptr<FakeClientProxy> callbacks = std::make_shared<FakeClientProxy>();
        std::shared_ptr<KVRemoteDaemon> daemon;
        std::shared_ptr<std::atomic<bool>> isOver = std::make_shared<std::atomic<bool>>(false);
    };

    ClientServiceContract() {
        manager->setDelegate(daemon);
        listener->setDelegate(gate);
        listener->resume();
    }

    /// What ends now is nobody's business any more: the next test records the log.
    ~ClientServiceContract() override {
        for (const IPCConnectionRef& each : gate->accepted.copy()) {
            each->setInterruptionHandler(nullptr);
            each->setInvalidationHandler(nullptr);
        }
    }

    Client connect(const ClientProgram& program) { return setUp(world.connectFrom(program, kClientService)); }
    /// One more connection of this very process.
    Client connectFromHere() { return setUp(world.connectFromHere(kClientService)); }

    Client setUp(const ConnectedProcess& process) {
        Client client;
        client.processIdentifier = process.processIdentifier;
        client.connection = process.connection;
        client.connection->setRemoteInterface(interfaceOf<KVDaemonProtocol>());
        client.connection->setExported(
            interfaceOf<KVClientProtocol>(),
            std::make_shared<ProtocolDispatcher<KVClientProtocol>>(client.callbacks));
        client.connection->setInvalidationHandler([isOver = client.isOver] { *isOver = true; });
        client.connection->resume();
        client.daemon = std::make_shared<KVRemoteDaemon>(*client.connection, nullptr);
        ++connections;
        EXPECT_TRUE(world.comesTrue([&] { return gate->accepted.copy().size() == connections; }));
        client.daemonsEnd = gate->accepted.copy().back();
        return client;
    }
    /// Everything that was sent before it has been served.
    void pauseAndWait(const Client& client) {
        const std::size_t before = daemon->requests().size();
        client.daemon->pauseRecording();
        ASSERT_TRUE(world.comesTrue([&] { return daemon->requests().size() > before; }));
    }
    std::vector<std::string> linesAbout(const std::string& part) const {
        std::vector<std::string> lines = log.texts();
        std::erase_if(lines, [&](const std::string& line) { return line.find(part) == std::string::npos; });
        return lines;
    }
    bool hears(const Client& client, std::size_t count) {
        return world.comesTrue([&] { return client.callbacks->messages().size() == count; });
    }
    bool ends(const Client& client) {
        return world.comesTrue([&] { return client.isOver->load(); });
    }
    /// Ends it from the client's side; the daemon has been told of both events.
    void leave(const Client& client) {
        const std::size_t before = daemon->departures.copy().size();
        client.connection->invalidate();
        ASSERT_TRUE(world.comesTrue([&] { return daemon->departures.copy().size() == before + 2; }));
    }
    void setUpBroadcast(const Client& client, const Bytes& configuration, ErrorHandler handler) {
        client.daemon->setupBroadcastWithHostBundleID("host", "extension", configuration, {},
                                                      std::move(handler));
    }

    std::size_t connections = 0;
    LogRecorder log;
    World world;
    std::shared_ptr<IPCTransport> transport = world.transport();
    std::shared_ptr<FakeDaemon> daemon = std::make_shared<FakeDaemon>();
    std::shared_ptr<KVConnectionManager> manager = std::make_shared<KVConnectionManager>(
        transport, std::make_shared<KVLocalization>(world.bundles(), world.languages()));
    std::shared_ptr<RememberingGate> gate = std::make_shared<RememberingGate>(manager);
    std::shared_ptr<IPCListener> listener = transport->createListener(kClientService);
    KVMultipleClientProxy everyone;
};

}  // namespace kelvo::test
