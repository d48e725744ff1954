#include "ipc/KVClientProtocolTable.h"
#include "ipc/KVRemoteDaemon.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "support/ChildProcess.h"
#include "support/TemporaryDirectory.h"

#include <csignal>
#include <future>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

/// A client without a bundle on the real daemon's socket.
class ClientTest : public testing::Test {
  protected:
    ClientTest() {
        EXPECT_TRUE(daemon.waitForLine("_srSetupTempDirectory")) << daemon.output();
        connect();
    }

    /// The daemon listens a moment after it has set its store up.
    void connect() {
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
        auto made = transport.connectToService("com.quillon.kelvod");
        while (!made && std::chrono::steady_clock::now() < deadline)
            made = transport.connectToService("com.quillon.kelvod");
        ASSERT_TRUE(made) << made.error().description();
        connection = *made;
        connection->setRemoteInterface(interfaceOf<KVDaemonProtocol>());
        connection->setInterruptionHandler([this] { interrupted.set_value(); });
        remote = std::make_unique<KVRemoteDaemon>(
            *connection, [this](const KVError& error) { failed.set_value(error.code()); });
        connection->resume();
    }

    const test::TemporaryDirectory root;
    test::ChildProcess daemon{{KELVOD_PROGRAM, "--root", root.path(), "--log", "stderr"},
                              {{"DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nonexistent"}}};
    std::promise<void> interrupted;
    std::promise<std::int64_t> failed;
    SocketTransport transport{std::make_shared<const DeviceRoot>(root.path(), root.path() + "/resources"),
                              nullptr};
    IPCConnectionRef connection;
    std::unique_ptr<KVRemoteDaemon> remote;
};

constexpr std::chrono::seconds kPatience{10};

TEST_F(ClientTest, RequestsAreAnswered) {
    std::promise<std::optional<Dictionary>> state;
    remote->synchronousGetCurrentState([&](const auto& answer) { state.set_value(answer); });
    auto stateCame = state.get_future();
    ASSERT_EQ(stateCame.wait_for(kPatience), std::future_status::ready);
    EXPECT_EQ(stateCame.get(), std::nullopt);
    std::promise<std::int64_t> code;
    remote->startRecordingWindowLayerContextIDs(
        {1}, {100, 100}, false, false, false, false, false, nullptr,
        [&](const OptionalError& error, bool, bool) { code.set_value(error ? error->code() : 0); });
    auto codeCame = code.get_future();
    ASSERT_EQ(codeCame.wait_for(kPatience), std::future_status::ready);
    EXPECT_EQ(codeCame.get(), -5803);
    connection->setInterruptionHandler(nullptr);
}

TEST_F(ClientTest, DaemonThatIsKilledIsAnInterruption) {
    daemon.signal(SIGKILL);
    EXPECT_EQ(interrupted.get_future().wait_for(kPatience), std::future_status::ready);
}

TEST_F(ClientTest, SetUpWithoutARightIsRefused) {
    std::promise<std::int64_t> code;
    remote->setupBroadcastWithHostBundleID(
        "a", "b", {}, {}, [&](const OptionalError& error) { code.set_value(error ? error->code() : 0); });
    auto codeCame = code.get_future();
    ASSERT_EQ(codeCame.wait_for(kPatience), std::future_status::ready);
    EXPECT_EQ(codeCame.get(), -5819);
    connection->setInterruptionHandler(nullptr);
}

TEST_F(ClientTest, SocketGoesWithTheDaemon) {
    connection->setInterruptionHandler(nullptr);
    daemon.signal(SIGTERM);
    EXPECT_EQ(daemon.waitForExit(), 0) << daemon.output();
    EXPECT_FALSE(transport.connectToService("com.quillon.kelvod"));
}

}  // namespace
}  // namespace kelvo
