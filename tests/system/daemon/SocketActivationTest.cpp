#include "ipc/KVRemoteDaemon.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "support/ChildProcess.h"
#include "support/Eventually.h"
#include "support/TemporaryDirectory.h"

#include <csignal>
#include <filesystem>
#include <future>
#include <sys/socket.h>
#include <sys/un.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

constexpr std::chrono::seconds kPatience{10};

/// The real daemon, with a socket on which this test, as the service manager, listens already.
class SocketActivationTest : public testing::Test {
  protected:
    SocketActivationTest() {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        path.copy(address.sun_path, sizeof(address.sun_path) - 1);
        EXPECT_EQ(::bind(socket.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
        EXPECT_EQ(::listen(socket.get(), 16), 0);
    }

    /// `listenPid` as a shell says it.
    std::unique_ptr<test::ChildProcess> start(const std::string& listenPid) const {
        const std::string script = "exec 3<&" + std::to_string(socket.get()) +
                                   "; export LISTEN_FDS=1 LISTEN_PID=" + listenPid +
                                   "; exec \"$0\" --root \"$1\" --log stderr";
        return std::make_unique<test::ChildProcess>(
            std::vector<std::string>{"bash", "-c", script, KELVOD_PROGRAM, root.path()},
            std::map<std::string, std::string>{{"DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nonexistent"}});
    }

    /// A client that connects now; its request may be answered later.
    struct Client {
        IPCConnectionRef connection;
        std::shared_ptr<std::promise<bool>> answered = std::make_shared<std::promise<bool>>();
    };
    Client ask() {
        Client client;
        auto made = transport.connectToSocket(path);
        if (!made) return client;
        client.connection = *made;
        client.connection->setRemoteInterface(interfaceOf<KVDaemonProtocol>());
        client.connection->resume();
        KVRemoteDaemon(*client.connection, nullptr)
            .synchronousIsBroadcastingWithPreferredExtension(
                "a", [answered = client.answered](bool) { answered->set_value(true); });
        return client;
    }
    static bool isAnswered(const Client& client) {
        return client.answered->get_future().wait_for(kPatience) == std::future_status::ready;
    }

    const test::TemporaryDirectory root;
    const std::string path = root.path() + "/com.quillon.kelvod";
    const UniqueFd socket{::socket(AF_UNIX, SOCK_STREAM, 0)};  // inherited by what is started
    SocketTransport transport{std::make_shared<const DeviceRoot>(root.path(), ""), nullptr};
};

TEST_F(SocketActivationTest, ClientThatCameBeforeTheDaemonIsServed) {
    const Client client = ask();
    const auto daemon = start("$$");
    EXPECT_TRUE(isAnswered(client)) << daemon->output();
    EXPECT_FALSE(std::filesystem::exists(root.path() + "/run/kelvod/com.quillon.kelvod"));
}

TEST_F(SocketActivationTest, SocketOutlivesTheDaemonAndTheNextOneServesIt) {
    const auto first = start("$$");
    EXPECT_TRUE(isAnswered(ask()));
    first->signal(SIGTERM);
    EXPECT_EQ(first->waitForExit(), 0) << first->output();
    EXPECT_TRUE(std::filesystem::exists(path));
    const Client waiting = ask();
    ASSERT_TRUE(waiting.connection) << "the socket was shut";
    const auto second = start("$$");
    EXPECT_TRUE(isAnswered(waiting)) << second->output();
}

TEST_F(SocketActivationTest, SocketThatIsMeantForAnotherProcessIsLeftAlone) {
    const auto daemon = start("1");
    EXPECT_TRUE(test::eventually([this] {
        return std::filesystem::exists(root.path() + "/run/kelvod/com.quillon.kelvod");
    })) << daemon->output();
}

}  // namespace
}  // namespace kelvo
