#include "platform/linux/x11/MirroringState.h"
#include "platform/linux/x11/XConnection.h"
#include "support/Eventually.h"
#include "support/TemporaryDirectory.h"
#include "support/x11/XClient.h"
#include "support/x11/XvfbServer.h"

#include <array>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <string>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo::x11 {
namespace {

using namespace std::chrono_literals;

/// Listens where an X server would, and never answers.
class SilentServer {
  public:
    explicit SilentServer(int clients) {
        ::mkdir("/tmp/.X11-unix", 01777);
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        std::memcpy(address.sun_path, path_.data(), path_.size());
        listener_.reset(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
        ::unlink(path_.c_str());
        EXPECT_EQ(::bind(listener_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
        EXPECT_EQ(::listen(listener_.get(), clients), 0);
    }
    ~SilentServer() { ::unlink(path_.c_str()); }
    SilentServer(const SilentServer&) = delete;
    SilentServer& operator=(const SilentServer&) = delete;

    std::string display() const { return ":" + number_; }

  private:
    // No display has a number like a process's; each test has a process of its own.
    const std::string number_ = std::to_string(100000 + ::getpid());
    const std::string path_ = "/tmp/.X11-unix/X" + number_;
    UniqueFd listener_;
};

std::ptrdiff_t descriptorCount() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"),
                         std::filesystem::directory_iterator());
}

/// The file in which clients find the cookie of every local server.
std::string authorityWith(std::string_view cookie) {
    std::array<char, 256> host{};
    ::gethostname(host.data(), host.size() - 1);
    std::string file{'\x01', '\x00'};  // local
    for (const std::string_view field : {std::string_view(host.data()), std::string_view(),
                                         std::string_view("MIT-MAGIC-COOKIE-1"), cookie}) {
        file += static_cast<char>(field.size() >> 8U);
        file += static_cast<char>(field.size());
        file += field;
    }
    return file;
}

TEST(XConnectionTest, ServerThatTakesClientsButDoesNotAnswerIsGivenUp) {
    const SilentServer server(8);
    const auto before = descriptorCount();
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_EQ(XConnection::open(server.display()), nullptr);
    EXPECT_GE(std::chrono::steady_clock::now() - begin, XConnection::kReplyLimit);
    EXPECT_EQ(descriptorCount(), before);
}

TEST(XConnectionTest, WaitingForTheFirstAnswerCanBeInterrupted) {
    const SilentServer server(8);
    WakeEvent interrupt;
    std::thread interrupter([&] {
        std::this_thread::sleep_for(20ms);
        interrupt.set();
    });
    EXPECT_EQ(XConnection::open(server.display(), interrupt.descriptor()), nullptr);
    interrupter.join();
}

TEST(XConnectionTest, ServerWhoseQueueOfClientsIsFullIsNotWaitedFor) {
    const SilentServer server(0);
    WakeEvent interrupt;
    interrupt.set();
    // The first of them waits in the queue, which then has no room.
    EXPECT_EQ(XConnection::open(server.display(), interrupt.descriptor()), nullptr);
    WakeEvent never;
    EXPECT_EQ(XConnection::open(server.display(), never.descriptor()), nullptr);
}

TEST(XConnectionTest, ServerOnAnotherMachineIsNotOneToCapture) {
    EXPECT_EQ(XConnection::open("elsewhere.example:0"), nullptr);
    EXPECT_EQ(XConnection::open("no display"), nullptr);
}

TEST(XConnectionTest, CookieOpensTheServerThatAsksForIt) {
    const test::TemporaryDirectory folder;
    const std::string right = folder.write("right", authorityWith("0123456789abcdef"));
    const std::string wrong = folder.write("wrong", authorityWith("fedcba9876543210"));
    const test::XvfbServer server(100, 100, "", "-auth " + right);
    ::setenv("XAUTHORITY", wrong.c_str(), 1);  // NOLINT(concurrency-mt-unsafe): this thread alone reads it
    EXPECT_EQ(XConnection::open(server.display()), nullptr);
    ::setenv("XAUTHORITY", right.c_str(), 1);  // NOLINT(concurrency-mt-unsafe)
    EXPECT_NE(XConnection::open(server.display()), nullptr);
}

TEST(XConnectionTest, ScreenThatTheServerLacksIsNone) {
    const test::XvfbServer server(100, 100);
    EXPECT_NE(XConnection::open(server.display() + ".0"), nullptr);
    EXPECT_EQ(XConnection::open(server.display() + ".5"), nullptr);
}

}  // namespace
}  // namespace kelvo::x11
