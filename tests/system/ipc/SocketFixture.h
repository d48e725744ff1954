#pragma once

#include "ipc/KVClientProtocolTable.h"
#include "ipc/KVConnectionManager.h"
#include "ipc/KVRemoteDaemon.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/Eventually.h"
#include "support/FakeClientProxy.h"
#include "support/FakeDaemon.h"
#include "support/LogRecorder.h"
#include "support/TemporaryDirectory.h"

#include <atomic>
#include <chrono>
#include <memory>
#include <string>
#include <unistd.h>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::test {

/// The connection manager before a fake daemon, on a real socket, and clients of it.
class SocketFixture : public testing::Test {
  protected:
    struct Client {
        IPCConnectionRef connection;
        std::shared_ptr<FakeClientProxy> callbacks = std::make_shared<FakeClientProxy>();
        std::shared_ptr<KVRemoteDaemon> daemon;
        std::shared_ptr<std::atomic<int>> errors = std::make_shared<std::atomic<int>>(0);
        std::shared_ptr<std::atomic<int>> interruptions = std::make_shared<std::atomic<int>>(0);
        std::shared_ptr<std::atomic<int>> invalidations = std::make_shared<std::atomic<int>>(0);
    };

    /// Keeps what was accepted; privileged, so that set-up requests pass.
    class Gate : public IPCListenerDelegate {
      public:
        explicit Gate(std::shared_ptr<KVConnectionManager> manager) : manager_(std::move(manager)) {}
        bool listenerShouldAcceptNewConnection(IPCListener& listener,
                                               const IPCConnectionRef& connection) override {
            const bool isKept = manager_->listenerShouldAcceptNewConnection(listener, connection);
            accepted.with([&](auto& all) { all.push_back(connection); });  // now that it is set up
            return isKept;
        }
        Guarded<std::vector<IPCConnectionRef>> accepted;

      private:
        const std::shared_ptr<KVConnectionManager> manager_;
    };

    SocketFixture() {
        SimulatedBundleContent content;
        content.bundleIdentifier = "com.example.test";
        content.entitlements = {{"com.quillon.private.kelvo-kit", true}};
        device.bundles->addBundle("/Applications/Test", content);
        device.bundles->addProcess(::getpid(), "/Applications/Test/program");
        manager->setDelegate(daemon);
        listener->setDelegate(gate);
        listener->resume();
    }

    Client setUp(IPCConnectionRef connection) {
        Client client;
        client.connection = std::move(connection);
        client.connection->setRemoteInterface(interfaceOf<KVDaemonProtocol>());
        client.connection->setExported(
            interfaceOf<KVClientProtocol>(),
            std::make_shared<ProtocolDispatcher<KVClientProtocol>>(client.callbacks));
        client.connection->setInterruptionHandler([count = client.interruptions] { ++*count; });
        client.connection->setInvalidationHandler([count = client.invalidations] { ++*count; });
        client.daemon = std::make_shared<KVRemoteDaemon>(
            *client.connection, [errors = client.errors](const KVError&) { ++*errors; });
        client.connection->resume();
        return client;
    }
    Client connect() { return setUp(*transport->connectToService("com.quillon.kelvod")); }

    /// The daemon's end of the client that connected last.
    IPCConnectionRef acceptedLast(std::size_t count = 1) {
        EXPECT_TRUE(eventually([&] { return gate->accepted.copy().size() >= count; }));
        return gate->accepted.copy().back();
    }
    std::vector<std::string> cutOffs() const {
        std::vector<std::string> lines = log.texts();
        std::erase_if(lines,
                      [](const std::string& line) { return line.find("cut off") == std::string::npos; });
        return lines;
    }
    /// A client that behaves is served.
    void expectOthersAreServed() {
        std::atomic<bool> isAnswered{false};
        const Client other = connect();
        other.daemon->synchronousGetCurrentState([&](const auto&) { isAnswered = true; });
        EXPECT_TRUE(eventually([&] { return isAnswered.load(); }));
        other.connection->invalidate();
        EXPECT_TRUE(eventually([&] { return *other.invalidations == 1; }));
    }

    const TemporaryDirectory root;
    const std::string path = root.path() + "/run/kelvod/com.quillon.kelvod";
    LogRecorder log;
    SimulatedDevice device;
    std::shared_ptr<FakeDaemon> daemon = std::make_shared<FakeDaemon>();
    /// How far the transport's clock is ahead of the true one.
    std::shared_ptr<std::atomic<std::chrono::seconds::rep>> secondsAhead =
        std::make_shared<std::atomic<std::chrono::seconds::rep>>(0);
    std::shared_ptr<SocketTransport> transport = std::make_shared<SocketTransport>(
        std::make_shared<const DeviceRoot>(root.path(), root.path() + "/resources"), device.bundles,
        [ahead = secondsAhead] { return std::chrono::steady_clock::now() + std::chrono::seconds(*ahead); });
    std::shared_ptr<KVConnectionManager> manager = std::make_shared<KVConnectionManager>(
        transport, std::make_shared<KVLocalization>(device.bundles, device.languages));
    std::shared_ptr<Gate> gate = std::make_shared<Gate>(manager);
    std::shared_ptr<IPCListener> listener = transport->createListener("com.quillon.kelvod");
};

}  // namespace kelvo::test
