#include "support/ChildProcess.h"
#include "support/TemporaryDirectory.h"

#include <array>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <string>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

namespace fs = std::filesystem;

/// The real daemon on a root of its own. Without a system bus, so that every machine behaves alike.
class StartAndStopTest : public testing::Test {
  protected:
    static std::vector<std::string> command(std::vector<std::string> arguments) {
        arguments.insert(arguments.begin(), KELVOD_PROGRAM);
        return arguments;
    }
    static test::ChildProcess start(const std::vector<std::string>& arguments) {
        return test::ChildProcess(command(arguments),
                                  {{"DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nonexistent"}});
    }
    test::ChildProcess startOnRoot() const { return start({"--root", root.path(), "--log", "stderr"}); }

    const test::TemporaryDirectory root;
};

TEST_F(StartAndStopTest, StartsOnAFreshRootAndEndsCleanlyOnSigterm) {
    test::ChildProcess daemon = startOnRoot();
    ASSERT_TRUE(daemon.waitForLine("kelvod Starting!")) << daemon.output();
    ASSERT_TRUE(daemon.waitForLine("_srSetupTempDirectory"));
    daemon.signal(SIGTERM);
    EXPECT_EQ(daemon.waitForExit(), 0) << daemon.output();
    const fs::path store = root.path() + "/private/var/mobile/Library/KelvoKit";
    EXPECT_TRUE(fs::is_directory(store));
    EXPECT_EQ(fs::status(store).permissions() & (fs::perms::group_all | fs::perms::others_all),
              fs::perms::none);
}

TEST_F(StartAndStopTest, EndsCleanlyOnSigint) {
    test::ChildProcess daemon = startOnRoot();
    ASSERT_TRUE(daemon.waitForLine("_srSetupTempDirectory"));
    daemon.signal(SIGINT);
    EXPECT_EQ(daemon.waitForExit(), 0);
}

TEST_F(StartAndStopTest, MayHaveAsManyDescriptorsAsTheSystemLetsIt) {
    const std::string script =
        "ulimit -Sn 300; ulimit -Hn 2000; exec " KELVOD_PROGRAM " --root " + root.path() + " --log stderr";
    test::ChildProcess daemon({"sh", "-c", script}, {{"DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nonexistent"}});
    ASSERT_TRUE(daemon.waitForLine("_srSetupTempDirectory")) << daemon.output();
    std::ifstream limits("/proc/" + std::to_string(daemon.processIdentifier()) + "/limits");
    std::string line;
    while (std::getline(limits, line) && !line.starts_with("Max open files")) {
    }
    EXPECT_NE(line.find(" 2000 "), std::string::npos) << line;
    EXPECT_EQ(line.find(" 300 "), std::string::npos) << line;
}

TEST_F(StartAndStopTest, SecondDaemonOnTheSameRootIsRefused) {
    test::ChildProcess first = startOnRoot();
    ASSERT_TRUE(first.waitForLine("_srSetupTempDirectory"));
    test::ChildProcess second = startOnRoot();
    EXPECT_EQ(second.waitForExit(), 1);
    EXPECT_EQ(second.output(), "kelvod: another kelvod runs on the root " + root.path() + "\n");
}

TEST_F(StartAndStopTest, DaemonStartsAgainAfterItWasKilled) {
    test::ChildProcess first = startOnRoot();
    ASSERT_TRUE(first.waitForLine("_srSetupTempDirectory"));
    first.signal(SIGKILL);
    first.waitForExit();
    test::ChildProcess second = startOnRoot();
    EXPECT_TRUE(second.waitForLine("_srSetupTempDirectory")) << second.output();
}

TEST_F(StartAndStopTest, RootThatCannotBeMadeIsOneLineAndAFailure) {
    test::ChildProcess daemon = start({"--root", "/dev/null/root"});
    EXPECT_EQ(daemon.waitForExit(), 1);
    EXPECT_EQ(
        daemon.output(),
        "kelvod: cannot use the root /dev/null/root: /dev/null/root/run/kelvod/lock: Not a directory\n");
}

TEST_F(StartAndStopTest, StoreThatCannotBeMadeIsOneLineAndAFailure) {
    root.write("private", "in the way");
    test::ChildProcess daemon = start({"--root", root.path()});
    EXPECT_EQ(daemon.waitForExit(), 1);
    EXPECT_EQ(daemon.output(), "kelvod: cannot use the root " + root.path() + ": " + root.path() +
                                   "/private/var/mobile/Library/KelvoKit/: Not a directory\n");
}

TEST_F(StartAndStopTest, UnknownOptionIsOneLineAndAWrongUsage) {
    test::ChildProcess daemon = start({"--bogus"});
    EXPECT_EQ(daemon.waitForExit(), 2);
    EXPECT_EQ(daemon.output(), "kelvod: unknown option --bogus\n");
}

TEST_F(StartAndStopTest, ServiceManagerIsToldWhenTheDaemonIsReady) {
    const std::string path = root.path() + "/notify";
    const UniqueFd socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof(address.sun_path) - 1);
    ASSERT_EQ(::bind(socket.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
    const timeval patience{10, 0};
    ::setsockopt(socket.get(), SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof(patience));
    const test::ChildProcess daemon(command({"--root", root.path()}), {{"NOTIFY_SOCKET", path}});
    std::array<char, 64> message{};
    ASSERT_GT(::recv(socket.get(), message.data(), message.size() - 1, 0), 0);
    EXPECT_STREQ(message.data(), "READY=1");
}

}  // namespace
}  // namespace kelvo
