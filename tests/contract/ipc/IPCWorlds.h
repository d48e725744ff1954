#pragma once

#include "platform/linux/files/DeviceRoot.h"
#include "platform/linux/ipc/SocketConnection.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/Eventually.h"
#include "support/ForeignSocket.h"
#include "support/TemporaryDirectory.h"

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {

/// The program of a process that connects: the bundle that holds it, if any, and the bundle's rights.
struct ClientProgram {
    std::optional<std::string> bundleIdentifier;
    Dictionary entitlements;
};

/// A process that is connected to a service. The connection is not resumed yet.
struct ConnectedProcess {
    std::int32_t processIdentifier = 0;
    IPCConnectionRef connection;
};

/// What the worlds share: bundles, and processes that run from them.
class IPCWorldBase {
  public:
    const std::shared_ptr<SimulatedBundles>& bundles() { return device_.bundles; }
    const std::shared_ptr<Languages> languages() { return device_.languages; }

  protected:
    void addProcess(std::int32_t processIdentifier, const ClientProgram& program) {
        if (!program.bundleIdentifier) return;
        const std::string folder = "/Applications/" + std::to_string(processIdentifier);
        SimulatedBundleContent content;
        content.bundleIdentifier = *program.bundleIdentifier;
        content.entitlements = program.entitlements;
        bundles()->addBundle(folder, content);
        bundles()->addProcess(processIdentifier, folder + "/program");
    }

    SimulatedDevice device_;
};

/// Connections inside this process; processes are numbers.
class SimulatedIPCWorld : public IPCWorldBase {
  public:
    std::shared_ptr<IPCTransport> transport() { return device_.ipc; }

    ConnectedProcess connectFrom(const ClientProgram& program, const std::string& service) {
        const std::int32_t processIdentifier = nextProcess_++;
        addProcess(processIdentifier, program);
        device_.ipc->setIdentity(processIdentifier, program.entitlements);
        return {processIdentifier, *device_.ipc->connectToService(service)};
    }
    /// A connection of this process itself, which may have several.
    ConnectedProcess connectFromHere(const std::string& service) {
        device_.ipc->setIdentity(::getpid(), {});
        return {::getpid(), *device_.ipc->connectToService(service)};
    }

    /// Lets everything run, and says whether it came to that.
    bool comesTrue(const std::function<bool()>& condition) {
        device_.settle();
        return condition();
    }

  private:
    std::int32_t nextProcess_ = 1000;
};

/// D-Bus over sockets; every process is one.
class SocketIPCWorld : public IPCWorldBase {
  public:
    ~SocketIPCWorld() { clientLoop_->stop(); }

    std::shared_ptr<IPCTransport> transport() { return transport_; }

    ConnectedProcess connectFrom(const ClientProgram& program, const std::string& service) {
        processes_.push_back(std::make_unique<ForeignSocket>(
            root_.path() + "/run/kelvod/" + service, [&](pid_t process) { addProcess(process, program); }));
        ForeignSocket& process = *processes_.back();
        return {process.processIdentifier(),
                std::make_shared<SocketConnection>(SocketConnection::Side::client, process.take(),
                                                   clientLoop_, nullptr, nullptr, nullptr)};
    }
    ConnectedProcess connectFromHere(const std::string& service) {
        return {::getpid(), *transport_->connectToService(service)};
    }

    bool comesTrue(const std::function<bool()>& condition) { return eventually(condition); }

  private:
    const TemporaryDirectory root_;
    const std::shared_ptr<SocketTransport> transport_ = std::make_shared<SocketTransport>(
        std::make_shared<const DeviceRoot>(root_.path(), root_.path() + "/resources"), device_.bundles);
    const std::shared_ptr<SocketLoop> clientLoop_ = std::make_shared<SocketLoop>();
    std::vector<std::unique_ptr<ForeignSocket>> processes_;
};

using IPCWorlds = testing::Types<SimulatedIPCWorld, SocketIPCWorld>;

struct IPCWorldNames {
    template <typename World>
    static std::string GetName(int) {
        return std::is_same_v<World, SimulatedIPCWorld> ? "Simulated" : "Socket";
    }
};

}  // namespace kelvo::test
