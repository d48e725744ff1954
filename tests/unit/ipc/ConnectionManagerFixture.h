#pragma once

#include "ipc/KVClientProtocolTable.h"
#include "ipc/KVConnectionManager.h"
#include "ipc/KVMultipleClientProxy.h"
#include "ipc/KVRemoteDaemon.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/FakeClientProxy.h"
#include "support/FakeDaemon.h"
#include "support/LogRecorder.h"

#include <algorithm>
#include <memory>
#include <string>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::test {

/// A connection manager that listens on a simulated device, before a fake daemon.
class ConnectionManagerFixture : public testing::Test {
  protected:
    /// A client process, connected.
    struct Client {
        IPCConnectionRef connection;
        std::shared_ptr<FakeClientProxy> callbacks = std::make_shared<FakeClientProxy>();
        std::shared_ptr<KVRemoteDaemon> daemon;
        std::shared_ptr<Guarded<std::vector<std::int64_t>>> errors =
            std::make_shared<Guarded<std::vector<std::int64_t>>>();
    };

    ConnectionManagerFixture() {
        manager->setDelegate(daemon);
        listener->setDelegate(manager);
        listener->resume();
    }

    void addApplication(std::int32_t processIdentifier, const std::string& bundleID) {
        SimulatedBundleContent content;
        content.bundleIdentifier = bundleID;
        device.bundles->addBundle("/Applications/" + bundleID, content);
        device.bundles->addProcess(processIdentifier, "/Applications/" + bundleID + "/program");
    }

    Client connect(std::int32_t processIdentifier, Dictionary entitlements = {}) {
        device.ipc->setIdentity(processIdentifier, std::move(entitlements));
        Client client;
        client.connection = *device.ipc->connectToService("com.quillon.kelvod");
        client.connection->setRemoteInterface(interfaceOf<KVDaemonProtocol>());
        client.connection->setExported(
            interfaceOf<KVClientProtocol>(),
            std::make_shared<ProtocolDispatcher<KVClientProtocol>>(client.callbacks));
        client.connection->resume();
        client.daemon = std::make_shared<KVRemoteDaemon>(
            *client.connection, [errors = client.errors](const KVError& error) {
                errors->with([&](auto& all) { all.push_back(error.code()); });
            });
        device.settle();
        return client;
    }

    std::vector<std::string> linesAbout(const std::string& part) const {
        std::vector<std::string> lines = log.texts();
        std::erase_if(lines, [&](const std::string& line) { return line.find(part) == std::string::npos; });
        return lines;
    }

    LogRecorder log;
    SimulatedDevice device;
    std::shared_ptr<FakeDaemon> daemon = std::make_shared<FakeDaemon>();
    std::shared_ptr<KVConnectionManager> manager = std::make_shared<KVConnectionManager>(
        device.ipc, std::make_shared<KVLocalization>(device.bundles, device.languages));
    std::shared_ptr<IPCListener> listener = device.ipc->createListener("com.quillon.kelvod");
};

}  // namespace kelvo::test
