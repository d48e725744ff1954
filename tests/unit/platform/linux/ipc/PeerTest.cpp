#include "platform/linux/ipc/Peer.h"
#include "platform/simulated/SimulatedBundles.h"
#include "support/ForeignSocket.h"
#include "support/TemporaryDirectory.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

/// No system has it.
constexpr int kUnknownOption = 4095;

/// The daemon's end of a connection that another process made. With an option that is unknown, as on systems
/// before Linux 6.5, the process is looked up by its number.
class PeerTest : public testing::TestWithParam<int> {
  protected:
    PeerTest() {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        path.copy(address.sun_path, sizeof(address.sun_path) - 1);
        EXPECT_EQ(::bind(listener.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
        EXPECT_EQ(::listen(listener.get(), 1), 0);
        process.emplace(path, [](pid_t) {});
        socket.reset(::accept4(listener.get(), nullptr, nullptr, SOCK_CLOEXEC));
        SimulatedBundleContent content;
        content.bundleIdentifier = "com.example.app";
        content.entitlements = {{"right", true}};
        bundles->addBundle("/Applications/App", content);
        bundles->addProcess(process->processIdentifier(), "/Applications/App/program");
    }

    const test::TemporaryDirectory root;
    const std::string path = root.path() + "/socket";
    UniqueFd listener{::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)};
    std::optional<test::ForeignSocket> process;
    UniqueFd socket;
    const std::shared_ptr<SimulatedBundles> bundles = std::make_shared<SimulatedBundles>();
};

TEST_P(PeerTest, ProcessHasTheRightsOfItsBundleForAsLongAsItLives) {
    const Peer peer(socket.get(), bundles, GetParam());
    EXPECT_EQ(peer.processIdentifier(), process->processIdentifier());
    EXPECT_EQ(peer.user(), ::getuid());
    EXPECT_EQ(peer.entitlement("right"), Value(true));
    EXPECT_TRUE(peer.entitlement("other").isNothing());
    process->kill();
    EXPECT_TRUE(peer.entitlement("right").isNothing()) << "the number may be somebody else's by now";
}

TEST_P(PeerTest, ProcessThatEndedBeforeItWasLookedAtHasNoRights) {
    process->kill();
    const Peer peer(socket.get(), bundles, GetParam());
    EXPECT_EQ(peer.processIdentifier(), process->processIdentifier());
    EXPECT_TRUE(peer.entitlement("right").isNothing());
}

TEST_P(PeerTest, ForgottenProcessHasNoRights) {
    Peer peer(socket.get(), bundles, GetParam());
    peer.forget();
    EXPECT_TRUE(peer.entitlement("right").isNothing());
}

TEST_P(PeerTest, WithoutBundlesThereAreNoRights) {
    const Peer peer(socket.get(), nullptr, GetParam());
    EXPECT_EQ(peer.processIdentifier(), process->processIdentifier());
    EXPECT_TRUE(peer.entitlement("right").isNothing());
}

std::string optionName(const testing::TestParamInfo<int>& info) {
    return info.param == kUnknownOption ? "ByItsNumber" : "ByTheSystemsOption";
}
INSTANTIATE_TEST_SUITE_P(Systems, PeerTest, testing::Values(Peer::kProcessOption, kUnknownOption),
                         optionName);

}  // namespace
}  // namespace kelvo
