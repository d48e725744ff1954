#include "SocketFixture.h"
#include "WireCalls.h"
#include "ipc/KVClientProxy.h"
#include "platform/IPCBounds.h"
#include "support/RawSocket.h"

#include <sys/resource.h>
#include <sys/wait.h>
#include <thread>

namespace kelvo {
namespace {

using test::eventually;
using test::RawSocket;
using test::requestBytes;
using testing::ElementsAre;
using testing::IsEmpty;

/// Peers that keep the types and break the peace: slow ones, greedy ones, and many.
class HostileBehaviourTest : public test::SocketFixture {
  protected:
    std::string cutOff(const std::string& reason) const {
        return "IPC: cut off PID " + std::to_string(::getpid()) + ": " + reason;
    }
    /// Lets so much time pass; a client that behaves shows it to the transport.
    void wait(std::chrono::seconds time, const Client& bystander) {
        *secondsAhead += time.count();
        askFor(bystander, 1);
    }
    /// So many questions, one after the other, are answered.
    static void askFor(const Client& client, int count) {
        std::atomic<int> answers{0};
        for (int i = 0; i < count; ++i) {
            client.daemon->synchronousGetCurrentState([&](const auto&) { ++answers; });
            ASSERT_TRUE(eventually([&] { return answers == i + 1; }, std::chrono::seconds(30)));
        }
    }
};

TEST_F(HostileBehaviourTest, PeerThatNeverAuthenticatesIsCutOffInTheEnd) {
    const Client bystander = connect();
    RawSocket silent(path);
    RawSocket slow(path);
    slow.write(std::string(1, '\0') + "AUTH EXT");
    acceptedLast(3);
    askFor(bystander, 2);
    wait(ipc_bounds::kPatience - std::chrono::seconds(5), bystander);
    slow.write("ERNAL\r\n");  // a little more every now and then is no way out
    EXPECT_EQ(slow.readUntil("\r\n"), "DATA\r\n");
    EXPECT_THAT(cutOffs(), IsEmpty());
    wait(std::chrono::seconds(10), bystander);
    EXPECT_TRUE(silent.isCutOff());
    EXPECT_TRUE(slow.isCutOff());
    EXPECT_THAT(cutOffs(),
                ElementsAre(cutOff("no end of authentication"), cutOff("no end of authentication")));
    askFor(bystander, 1);
    EXPECT_EQ(*bystander.invalidations, 0);
}

TEST_F(HostileBehaviourTest, MessageHalfSentAndHeldEndsItsConnection) {
    const Client bystander = connect();
    const Bytes whole = requestBytes("pauseRecording", "", {});
    RawSocket peer(path);
    peer.authenticate();
    peer.write(whole);
    ASSERT_TRUE(eventually([&] { return daemon->requests().size() == 1; }));
    wait(2 * ipc_bounds::kPatience, bystander);
    EXPECT_THAT(cutOffs(), IsEmpty()) << "between messages there is no hurry";
    peer.write(std::span(whole).first(20));
    peer.write(std::span(whole).subspan(20, 10));
    // It has been read by the time that others, who came later, are served again and again.
    askFor(bystander, 20);
    wait(2 * ipc_bounds::kPatience, bystander);
    EXPECT_TRUE(peer.isCutOff());
    EXPECT_THAT(cutOffs(), ElementsAre(cutOff("message half sent and held")));
    EXPECT_EQ(*bystander.invalidations, 0);
}

TEST_F(HostileBehaviourTest, ClientThatNeverReadsIsCutOffAtTheBound) {
    RawSocket silent(path);
    silent.authenticate();
    KVClientProxy proxy(acceptedLast());
    const Client other = connect();
    const KVClientProxy otherProxy(acceptedLast(2));
    const Bytes sound(std::size_t{256} << 10);
    for (int i = 0; i < 100; ++i)
        proxy.captureHandlerWithAudioSample(sound, {}, 1, SampleBuffer::Type::microphone, {});
    EXPECT_THAT(cutOffs(), ElementsAre(cutOff("does not read what is sent to it")));
    // What was taken for it is what may wait and what the socket holds, however much more was offered.
    const std::size_t taken =
        100 - log.count("KVClientProxy:captureHandlerWithAudioSample: error getting remote proxy: 107");
    EXPECT_LE(taken * sound.size(), ipc_bounds::kMostUnsentBytes + (std::size_t{4} << 20));
    other.daemon->pauseRecording();
    EXPECT_TRUE(eventually([&] { return !daemon->requests().empty(); })) << "the others notice nothing";
}

TEST_F(HostileBehaviourTest, WhoeverAsksAndNeverReadsIsCutOff) {
    const Client bystander = connect();
    RawSocket peer(path);
    peer.authenticate();
    dbus::Message question;
    question.serial = 1;
    question.path = "/com/quillon/kelvod";
    question.interface = "org.freedesktop.DBus.Introspectable";
    question.member = "Introspect";
    const Bytes bytes = dbus::serialize(question);
    while (::send(peer.descriptor(), bytes.data(), bytes.size(), MSG_NOSIGNAL) > 0) {
    }
    EXPECT_TRUE(eventually([&] { return !cutOffs().empty(); }));
    EXPECT_THAT(cutOffs(), ElementsAre(cutOff("does not read what is sent to it")));
    askFor(bystander, 1);
    EXPECT_EQ(*bystander.invalidations, 0);
}

TEST_F(HostileBehaviourTest, TooManyOutstandingRequestsEndTheConnection) {
    daemon->keepsStopHandler = true;
    Guarded<std::vector<MovieHandler>> kept;
    daemon->onRequest.set([&](const std::string& request) {
        if (request == "stopRecordingWithHandler")
            kept.with([&](auto& all) { all.push_back(daemon->keptStopHandler.copy()); });
    });
    const Client client = connect();
    const Client bystander = connect();
    for (std::size_t i = 0; i < ipc_bounds::kMostOwedReplies + 2; ++i)
        client.daemon->stopRecordingWithHandler([](const auto&, const auto&) {});
    EXPECT_TRUE(eventually([&] { return *client.invalidations == 1; }));
    EXPECT_THAT(cutOffs(), ElementsAre(cutOff("more requests than may be outstanding")));
    askFor(bystander, 1);
    EXPECT_EQ(*bystander.invalidations, 0);
}

TEST_F(HostileBehaviourTest, PeersThatNeverStopSendingStarveNobody) {
    const Bytes request = requestBytes("pauseRecording", "", {});
    const Bytes question = test::wireCall("org.freedesktop.DBus.Introspectable", "Introspect", "", {});
    Bytes flood;
    for (int i = 0; i < 400; ++i) {
        const Bytes& next = i % 2 == 0 ? request : question;
        flood.insert(flood.end(), next.begin(), next.end());
    }
    std::vector<std::unique_ptr<RawSocket>> peers;
    std::vector<std::thread> senders;
    std::atomic<bool> isEnding{false};
    for (int i = 0; i < 4; ++i) {
        peers.push_back(std::make_unique<RawSocket>(path));
        peers.back()->authenticate();
        senders.emplace_back([&, peer = peers.back().get()] {
            while (!isEnding && ::send(peer->descriptor(), flood.data(), flood.size(), MSG_NOSIGNAL) ==
                                    ssize_t(flood.size())) {
            }
        });
    }
    EXPECT_TRUE(eventually([&] { return daemon->requests().size() > 100; }));
    const Client bystander = connect();
    const std::size_t before = daemon->requests().size();
    askFor(bystander, 30);
    const std::size_t meanwhile = daemon->requests().size() - before;
    EXPECT_GT(meanwhile, 30U) << "the flood went on";
    isEnding = true;
    for (const auto& peer : peers)
        ::shutdown(peer->descriptor(), SHUT_RDWR);
    for (std::thread& sender : senders)
        sender.join();
    EXPECT_THAT(cutOffs(), IsEmpty()) << "haste is no crime";
    EXPECT_EQ(*bystander.invalidations, 0);
}

TEST_F(HostileBehaviourTest, ComingAndGoingWithoutEndStarvesNobody) {
    std::atomic<bool> isEnding{false};
    std::atomic<int> visits{0};
    std::thread visitor([&] {
        // An end there is after all: the fixture keeps what the daemon has of each of them.
        while (!isEnding && visits < 3000) {
            const RawSocket peer(path);
            ++visits;
        }
    });
    EXPECT_TRUE(eventually([&] { return visits > 20; }));
    const Client bystander = connect();
    askFor(bystander, 10);
    isEnding = true;
    visitor.join();
    EXPECT_THAT(cutOffs(), IsEmpty());
}

TEST_F(HostileBehaviourTest, OneProcessMayHoldSoManyConnections) {
    std::vector<std::unique_ptr<RawSocket>> peers;
    for (std::size_t i = 0; i < ipc_bounds::kMostConnectionsOfOneProcess; ++i)
        peers.push_back(std::make_unique<RawSocket>(path));
    RawSocket oneTooMany(path);
    EXPECT_TRUE(oneTooMany.isCutOff());
    EXPECT_EQ(log.count("IPC: turned away PID " + std::to_string(::getpid()) + ": too many connections"), 1U);
    peers.clear();
    ASSERT_TRUE(eventually(
        [&] { return daemon->departures.copy().size() == 2 * ipc_bounds::kMostConnectionsOfOneProcess; }));
    expectOthersAreServed();
}

/// A process that opens so many connections and holds them until it is killed.
pid_t forkHolder(const std::string& path, std::size_t count) {
    const pid_t child = ::fork();
    if (child != 0) return child;
    // Only what may be called between fork and exit: plain sockets.
    for (std::size_t i = 0; i < count; ++i) {
        const int socket = ::socket(AF_UNIX, SOCK_STREAM, 0);
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        path.copy(address.sun_path, sizeof(address.sun_path) - 1);
        if (::connect(socket, reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0) ::_exit(1);
    }
    ::pause();
    ::_exit(0);
}

TEST_F(HostileBehaviourTest, ForkingIsNoWayAroundTheBoundOnAllConnections) {
    rlimit limit{};
    ::getrlimit(RLIMIT_NOFILE, &limit);
    if (limit.rlim_max < 4096) GTEST_SKIP() << "this system lets no process hold so many connections";
    limit.rlim_cur = limit.rlim_max;  // as the daemon does
    ::setrlimit(RLIMIT_NOFILE, &limit);
    constexpr std::size_t kEach = ipc_bounds::kMostConnectionsOfOneProcess;
    std::vector<pid_t> children;
    for (std::size_t i = 0; i < ipc_bounds::kMostConnections / kEach; ++i)
        children.push_back(forkHolder(path, kEach));
    EXPECT_TRUE(eventually([&] { return gate->accepted.copy().size() == ipc_bounds::kMostConnections; },
                           std::chrono::seconds(60)));
    RawSocket oneTooMany(path);
    EXPECT_TRUE(oneTooMany.isCutOff());
    for (const pid_t child : children) {
        ::kill(child, SIGKILL);
        ::waitpid(child, nullptr, 0);
    }
    EXPECT_TRUE(
        eventually([&] { return daemon->departures.copy().size() == 2 * ipc_bounds::kMostConnections; },
                   std::chrono::seconds(60)));
    expectOthersAreServed();
}

}  // namespace
}  // namespace kelvo
