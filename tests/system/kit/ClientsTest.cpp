#include "platform/IPCBounds.h"
#include "platform/linux/ipc/DBusMessage.h"
#include "support/ForeignSocket.h"
#include "support/daemon/DaemonWorld.h"
#include "support/media/MovieProbe.h"

#include <array>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <thread>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;
using test::ChildProcess;

constexpr std::chrono::seconds kPatience{60};
/// Of a message: little endian, a reply.
constexpr const char* kReplyBegins = "l\2";

/// A call without arguments that wants a reply, as any D-Bus library writes it.
Bytes requestNamed(const char* name, std::uint32_t serial) {
    dbus::Message message;
    message.serial = serial;
    message.path = "/com/quillon/kelvod";
    message.interface = "com.quillon.KelvoKit.KVDaemonProtocol";
    message.member = name;
    return dbus::serialize(message);
}

bool sendAll(int socket, const void* bytes, std::size_t size) {
    return ::send(socket, bytes, size, MSG_NOSIGNAL) == static_cast<ssize_t>(size);
}

bool authenticate(int socket) {
    constexpr std::string_view kGreeting("\0AUTH EXTERNAL\r\nDATA\r\nNEGOTIATE_UNIX_FD\r\nBEGIN\r\n", 48);
    return sendAll(socket, kGreeting.data(), kGreeting.size());
}

/// Whether something with `text` in it comes within a minute.
bool receives(int socket, const std::string& text) {
    std::string received;
    const auto deadline = std::chrono::steady_clock::now() + kPatience;
    while (std::chrono::steady_clock::now() < deadline) {
        pollfd source{socket, POLLIN, 0};
        if (::poll(&source, 1, 1000) <= 0) continue;
        std::array<char, 4096> buffer;
        const ssize_t count = ::recv(socket, buffer.data(), buffer.size(), 0);
        if (count <= 0) return false;
        received.append(buffer.data(), static_cast<std::size_t>(count));
        if (received.find(text) != std::string::npos) return true;
    }
    return false;
}

std::size_t descriptorsOf(pid_t process) {
    std::error_code ignored;
    const fs::directory_iterator all("/proc/" + std::to_string(process) + "/fd", ignored);
    return static_cast<std::size_t>(std::distance(begin(all), end(all)));
}

/// The daemon and applications that are processes of their own, with nobody in between.
class ClientsTest : public testing::Test {
  protected:
    void SetUp() override {
        ASSERT_TRUE(world.isUp()) << world.log();
        makeBundle("first");
    }

    /// An application's folder with its program.
    void makeBundle(const std::string& name, const char* program = KIT_CLIENT_PROGRAM) const {
        const fs::path folder = fs::path(world.root()) / "Applications" / name;
        fs::create_directories(folder);
        fs::copy_file(program, folder / "program");
        std::ofstream(folder / "Info.json")
            << R"({"identifier": "com.example.)" << name << R"(", "name": ")" << name
            << R"(", "displayName": ")" << name << R"(", "executable": "program"})";
    }
    std::map<std::string, std::string> environment() const {
        return {{"KELVO_SOCKET", world.socket()}, {"DISPLAY", world.display()}};
    }
    std::unique_ptr<ChildProcess> launch(const std::string& name, const std::string& argument) const {
        return std::make_unique<ChildProcess>(
            std::vector<std::string>{world.root() + "/Applications/" + name + "/program", argument},
            environment());
    }
    /// A shell that answers each alert so; without an answer it only shows them.
    void startShell(const std::string& answer) {
        std::vector<std::string> command{"sh", "-c", R"(exec "$0" shell --json "$@" 1>&2 </dev/null)",
                                         KELVOCTL_PROGRAM};
        if (!answer.empty()) command.insert(command.end(), {"--answer", answer});
        shell.reset();
        ASSERT_TRUE(test::eventually(
            [&] {
                shell = std::make_unique<ChildProcess>(command, environment());
                return test::eventually([&] { return isShown(); }, 3s);
            },
            kPatience));
    }
    /// Whether the daemon has taken the latest shell.
    bool isShown() const {
        return world.log().find("alerts are shown by PID: " + std::to_string(shell->processIdentifier())) !=
               std::string::npos;
    }
    static bool says(ChildProcess& process, const std::string& line) {
        return test::eventually([&] { return process.waitForLine(line); }, kPatience);
    }
    int status() const {
        ChildProcess process({"sh", "-c", R"(exec "$0" status >/dev/null)", KELVOCTL_PROGRAM}, environment());
        return process.waitForExit().value_or(-1);
    }

    test::DaemonWorld world;
    std::unique_ptr<ChildProcess> shell;
};

TEST_F(ClientsTest, ClientThatIsKilledWhileItRecordsEndsItsRecordingAlone) {
    ASSERT_NO_FATAL_FAILURE(startShell("other"));
    {
        const auto client = launch("first", "record");
        ASSERT_TRUE(says(*client, "started")) << client->output() << world.log();
        std::this_thread::sleep_for(1s);
        client->signal(SIGKILL);
    }
    EXPECT_TRUE(world.waitForLog("Stop mirroring")) << world.log();
    const auto next = launch("first", "record");
    EXPECT_TRUE(says(*next, "started")) << next->output() << world.log();
    EXPECT_EQ(status(), 0);
}

TEST_F(ClientsTest, ClientThatIsKilledWhileFramesAreSentToItHoldsUpNobody) {
    ASSERT_NO_FATAL_FAILURE(startShell("other"));
    for (int round = 0; round < 3; ++round) {
        const auto client = launch("first", "capture");
        ASSERT_TRUE(says(*client, "frames 20")) << client->output() << world.log();
        client->signal(SIGKILL);
    }
    EXPECT_EQ(status(), 0);
    makeBundle("second");
    const auto other = launch("second", "capture");
    EXPECT_TRUE(says(*other, "frames 20")) << other->output() << world.log();
}

TEST_F(ClientsTest, ClientThatIsKilledWhileItsUserIsAskedLeavesTheDaemonUsable) {
    ASSERT_NO_FATAL_FAILURE(startShell(""));
    {
        const auto client = launch("first", "capture");
        ASSERT_TRUE(says(*shell, "\"buttons\"")) << client->output() << world.log();
        client->signal(SIGKILL);
    }
    // The alert is still there; with its shell it goes, unanswered.
    ASSERT_NO_FATAL_FAILURE(startShell("other"));
    EXPECT_TRUE(world.waitForLog("user refused recording"));
    EXPECT_EQ(status(), 0);
    const auto next = launch("first", "capture");
    EXPECT_TRUE(says(*next, "frames 20")) << next->output() << world.log();
}

TEST_F(ClientsTest, DaemonThatIsKilledIsReportedAndFoundAgain) {
    ASSERT_NO_FATAL_FAILURE(startShell("other"));
    const auto client = launch("first", "capture");
    ASSERT_TRUE(says(*client, "frames 20")) << client->output() << world.log();
    world.daemon().signal(SIGKILL);
    EXPECT_TRUE(says(*client, "lost -5815")) << client->output();
    world.startDaemon();
    ASSERT_NO_FATAL_FAILURE(startShell("other"));
    ASSERT_TRUE(says(*client, "restored")) << client->output();
    EXPECT_TRUE(says(*client, "frames again 20")) << client->output() << world.log();
}

TEST_F(ClientsTest, TwoHundredClientsAreServedAtOnceAndLeaveNothingBehind) {
    constexpr int kClients = 200;
    ASSERT_EQ(status(), 0);
    const std::size_t before = descriptorsOf(world.daemon().processIdentifier());
    {
        std::vector<std::unique_ptr<test::ForeignSocket>> processes;
        std::vector<UniqueFd> sockets;
        for (int i = 0; i < kClients; ++i) {
            processes.push_back(std::make_unique<test::ForeignSocket>(world.socket(), [](pid_t) {}));
            sockets.push_back(processes.back()->take());
            ASSERT_TRUE(sockets.back());
        }
        const Bytes request = requestNamed("getCurrentBroadcastImages", 1);
        for (const UniqueFd& each : sockets) {
            ASSERT_TRUE(authenticate(each.get()));
            ASSERT_TRUE(sendAll(each.get(), request.data(), request.size()));
        }
        for (const UniqueFd& each : sockets)
            EXPECT_TRUE(receives(each.get(), kReplyBegins)) << world.log();
        EXPECT_EQ(status(), 0);
    }
    EXPECT_TRUE(test::eventually(
        [&] { return descriptorsOf(world.daemon().processIdentifier()) <= before + 2; }, kPatience))
        << before << " became " << descriptorsOf(world.daemon().processIdentifier());
    EXPECT_EQ(status(), 0);
}

TEST_F(ClientsTest, ClientThatNeverReadsIsCutOffAndACaptureGoesOn) {
    ASSERT_NO_FATAL_FAILURE(startShell("other"));
    const auto capturing = launch("first", "capture");
    ASSERT_TRUE(says(*capturing, "frames 20")) << capturing->output() << world.log();

    test::ForeignSocket process(world.socket(), [](pid_t) {});
    const UniqueFd deaf = process.take();
    ASSERT_TRUE(authenticate(deaf.get()));
    Bytes requests;
    for (std::uint32_t serial = 1; serial <= 64; ++serial) {
        const Bytes one = requestNamed("getCurrentBroadcastImages", serial);
        requests.insert(requests.end(), one.begin(), one.end());
    }
    const auto deadline = std::chrono::steady_clock::now() + 3 * kPatience;
    while (sendAll(deaf.get(), requests.data(), requests.size()))
        ASSERT_LT(std::chrono::steady_clock::now(), deadline) << "it is never cut off";
    EXPECT_TRUE(world.waitForLog("IPC: cut off PID " + std::to_string(process.processIdentifier()) +
                                 ": does not read what is sent to it"));
    EXPECT_EQ(capturing->output().find("ended"), std::string::npos);
    EXPECT_TRUE(says(*capturing, "frames 60")) << capturing->output();
    EXPECT_EQ(status(), 0);
}

TEST_F(ClientsTest, ExampleThatRecordsItselfPrintsAMovieThatItCanOpen) {
    ASSERT_NO_FATAL_FAILURE(startShell("other"));
    makeBundle("recorder", RECORD_ITSELF_PROGRAM);
    std::string said;
    ASSERT_TRUE(test::eventually(  // until its window is in front in time
        [&] {
            ChildProcess example(
                {"sh", "-c", R"(exec "$0" 1>&2)", world.root() + "/Applications/recorder/program"},
                environment());
            while (!example.waitForExit() && example.waitForLine("\n")) {
            }
            said = example.output();
            return said.find(".mp4") != std::string::npos;
        },
        kPatience))
        << said << world.log();
    const std::string movie = said.substr(0, said.find('\n'));
    EXPECT_TRUE(fs::exists(movie)) << movie;
    EXPECT_EQ(test::decodingComplaints(movie), "");
    EXPECT_EQ(test::probeStream(movie, "v:0", "codec_name"), "h264");
}

TEST_F(ClientsTest, ExampleThatCapturesItselfSeesItsFrames) {
    ASSERT_NO_FATAL_FAILURE(startShell("other"));
    makeBundle("capturer", CAPTURE_ITSELF_PROGRAM);
    std::string said;
    EXPECT_TRUE(test::eventually(
        [&] {
            ChildProcess example(
                {"sh", "-c", R"(exec "$0" 3 1>&2)", world.root() + "/Applications/capturer/program"},
                environment());
            const bool isDone = example.waitForExit() == 0;
            said = example.output();
            return isDone && said.find(" frames, ") != std::string::npos &&
                   said.find("\n0 frames") == std::string::npos;
        },
        kPatience))
        << said << world.log();
}

}  // namespace
}  // namespace kelvo
