#include "ipc/KVClientProtocolTable.h"
#include "ipc/KVClientProxy.h"
#include "ipc/KVConnectionManager.h"
#include "ipc/KVMultipleClientProxy.h"
#include "ipc/KVRemoteDaemon.h"
#include "platform/IPCBounds.h"
#include "platform/linux/ipc/DBusMessage.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/DaemonRequests.h"
#include "support/FakeClientProxy.h"
#include "support/FakeDaemon.h"
#include "support/LogRecorder.h"
#include "support/TemporaryDirectory.h"

#include <array>
#include <chrono>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using test::DaemonRequest;
using testing::ElementsAre;
using testing::IsEmpty;

/// Whether `condition` comes true within ten seconds.
template <typename Condition>
bool eventually(Condition condition) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
    while (!condition()) {
        if (std::chrono::steady_clock::now() > deadline) return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    return true;
}

/// A peer that writes to its socket what it likes.
class RawPeer {
  public:
    explicit RawPeer(const std::string& path) : socket_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        path.copy(address.sun_path, sizeof(address.sun_path) - 1);
        EXPECT_EQ(::connect(socket_.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
        const timeval patience{10, 0};
        ::setsockopt(socket_.get(), SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof(patience));
    }

    void write(const std::string& bytes) const {
        EXPECT_EQ(::send(socket_.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL),
                  static_cast<ssize_t>(bytes.size()));
    }
    void authenticate() const {
        write(std::string(1, '\0') + "AUTH EXTERNAL\r\nDATA\r\nNEGOTIATE_UNIX_FD\r\nBEGIN\r\n");
    }
    void writeMessage(const Bytes& bytes, int descriptor = -1) const {
        alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(int))> control{};
        iovec part{const_cast<std::byte*>(bytes.data()), bytes.size()};
        msghdr header{};
        header.msg_iov = &part;
        header.msg_iovlen = 1;
        if (descriptor >= 0) {
            header.msg_control = control.data();
            header.msg_controllen = control.size();
            cmsghdr* item = CMSG_FIRSTHDR(&header);
            item->cmsg_level = SOL_SOCKET;
            item->cmsg_type = SCM_RIGHTS;
            item->cmsg_len = CMSG_LEN(sizeof(int));
            std::memcpy(CMSG_DATA(item), &descriptor, sizeof(descriptor));
        }
        EXPECT_GT(::sendmsg(socket_.get(), &header, MSG_NOSIGNAL), 0);
    }
    /// Whether the other side ends the connection.
    bool isCutOff() const {
        std::array<char, 4096> buffer;
        ssize_t count = 1;
        while (count > 0)
            count = ::recv(socket_.get(), buffer.data(), buffer.size(), 0);
        return count == 0 || errno == ECONNRESET;
    }

  private:
    UniqueFd socket_;
};

class SocketTransportTest : public testing::Test {
  protected:
    struct Client {
        IPCConnectionRef connection;
        std::shared_ptr<test::FakeClientProxy> callbacks = std::make_shared<test::FakeClientProxy>();
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

    SocketTransportTest() {
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

    const test::TemporaryDirectory root;
    const std::string path = root.path() + "/run/kelvod/com.quillon.kelvod";
    test::LogRecorder log;
    SimulatedDevice device;
    std::shared_ptr<test::FakeDaemon> daemon = std::make_shared<test::FakeDaemon>();
    std::shared_ptr<SocketTransport> transport = std::make_shared<SocketTransport>(
        std::make_shared<const DeviceRoot>(root.path(), root.path() + "/resources"), device.bundles);
    std::shared_ptr<KVConnectionManager> manager = std::make_shared<KVConnectionManager>(
        transport, std::make_shared<KVLocalization>(device.bundles, device.languages));
    std::shared_ptr<Gate> gate = std::make_shared<Gate>(manager);
    std::shared_ptr<IPCListener> listener = transport->createListener("com.quillon.kelvod");
};

class SocketRequestTest : public SocketTransportTest, public testing::WithParamInterface<DaemonRequest> {};

TEST_P(SocketRequestTest, ArrivesUnchangedAndIsAnswered) {
    const Client client = connect();
    Guarded<std::vector<Array>> replies;
    GetParam().make(*client.daemon,
                    [&](Array reply) { replies.with([&](auto& all) { all.push_back(std::move(reply)); }); });
    EXPECT_TRUE(eventually([&] {
        return !daemon->arguments().empty() && (!GetParam().expectedReply || !replies.copy().empty());
    }));
    EXPECT_THAT(daemon->requests(), ElementsAre(GetParam().name));
    EXPECT_THAT(daemon->arguments(), ElementsAre(GetParam().expectedArguments));
    if (GetParam().expectedReply) {
        EXPECT_THAT(replies.copy(), ElementsAre(*GetParam().expectedReply));
    }
    client.connection->invalidate();
    EXPECT_TRUE(eventually([&] { return *client.invalidations == 1; }));
}

std::string requestName(const testing::TestParamInfo<DaemonRequest>& info) {
    return info.param.name;
}
INSTANTIATE_TEST_SUITE_P(All, SocketRequestTest, testing::ValuesIn(test::daemonRequests()), requestName);

TEST_F(SocketTransportTest, EveryCallbackArrivesAsItWasSent) {
    const Client client = connect();
    KVClientProxy proxy(acceptedLast());
    const KVError error("domain", -5, {{"nested", Array{Value(), Date{5}, URL("u"), KVError("d", 1)}}});
    proxy.updateBroadcastServiceInfo({{"a", std::uint64_t{UINT64_MAX}}, {"b", Bytes(3)}});
    proxy.updateBroadcastURL(URL("rtmp://x"));
    proxy.recordingDidStopWithError(error, URL("movie:m"));
    proxy.recordingLockInterrupted(error);
    proxy.recordingShouldResume();
    proxy.recordingDidPause();
    proxy.recordingTimerDidUpdate("00:01 é");
    const auto surface = std::make_shared<KVIOSurfaceObject>();
    surface->setIOSurface(*VideoSurface::create(VideoSurface::Geometry::packed(4, 2)));
    surface->ioSurface()->writablePixels()[5] = std::byte{77};
    proxy.captureHandlerWithSample(surface, bytesOfRecord(TimingRecord{{1, 30, 1, 0}, {5, 30, 1, 0}, {}}));
    const Bytes sound(4096, std::byte{9});
    proxy.captureHandlerWithAudioSample(sound, {}, 1024, SampleBuffer::Type::microphone, {});
    ASSERT_TRUE(eventually([&] { return client.callbacks->messages().size() == 9; }));
    using Stop = test::FakeClientProxy::Stop;
    EXPECT_THAT(client.callbacks->stops.copy(), ElementsAre(Stop{error, URL("movie:m")}));
    EXPECT_THAT(client.callbacks->lockInterruptions.copy(), ElementsAre(error));
    EXPECT_THAT(client.callbacks->timerTexts.copy(), ElementsAre("00:01 é"));
    EXPECT_EQ(client.callbacks->audioSamples.copy().at(0).audioData, sound);
    const auto frame = client.callbacks->videoSamples.copy().at(0).surface->ioSurface();
    ASSERT_NE(frame, nullptr);
    EXPECT_EQ(frame->pixels()[5], std::byte{77});
    EXPECT_TRUE(frame->writablePixels().empty());
    const void* writable = ::mmap(nullptr, 32, PROT_READ | PROT_WRITE, MAP_SHARED, frame->descriptor(), 0);
    EXPECT_EQ(writable, MAP_FAILED) << "a receiver can map the pixels but not write them";
}

TEST_F(SocketTransportTest, CallbackSentBeforeAuthenticationWaitsForItsEnd) {
    const auto connection = *transport->connectToService("com.quillon.kelvod");
    KVClientProxy proxy(acceptedLast());
    proxy.recordingTimerDidUpdate("00:01");  // the client has not said a word yet
    const Client client = setUp(connection);
    ASSERT_TRUE(eventually([&] { return !client.callbacks->messages().empty(); }));
    EXPECT_THAT(client.callbacks->timerTexts.copy(), ElementsAre("00:01"));
}

TEST_F(SocketTransportTest, LostPeerIsAnInterruptionAndThenAnInvalidation) {
    const Client client = connect();
    acceptedLast()->invalidate();
    EXPECT_TRUE(eventually([&] { return *client.invalidations == 1; }));
    EXPECT_EQ(*client.interruptions, 1);
}

TEST_F(SocketTransportTest, OwnInvalidationIsNoInterruption) {
    const Client client = connect();
    client.connection->invalidate();
    EXPECT_TRUE(eventually([&] { return *client.invalidations == 1; }));
    EXPECT_EQ(*client.interruptions, 0);
    EXPECT_TRUE(eventually([&] { return daemon->departures.copy().size() == 2; }));
}

TEST_F(SocketTransportTest, RequestWhoseReplyIsOwedFailsWhenThePeerIsLost) {
    daemon->keepsStopHandler = true;
    const Client client = connect();
    client.daemon->stopRecordingWithHandler([](const auto&, const auto&) { FAIL(); });
    ASSERT_TRUE(eventually([&] { return !daemon->requests().empty(); }));
    acceptedLast()->invalidate();
    EXPECT_TRUE(eventually([&] { return *client.errors == 1; }));
    daemon->keptStopHandler.exchange(nullptr)(std::nullopt, std::nullopt);
}

TEST_F(SocketTransportTest, EndpointIsAWayToItsListenerAlone) {
    const auto anonymous = *transport->createAnonymousListener();
    const auto anonymousGate = std::make_shared<Gate>(manager);
    anonymous->setDelegate(anonymousGate);
    anonymous->resume();
    const Client client = connect();
    client.daemon->startRecordingWindowLayerContextIDs({}, {}, false, false, false, false, false,
                                                       anonymous->endpoint(), nullptr);
    ASSERT_TRUE(eventually([&] { return daemon->endpoint.copy() != nullptr; }));
    const Client back = setUp(*transport->connectToEndpoint(daemon->endpoint.copy()));
    back.daemon->pauseRecording();
    EXPECT_TRUE(eventually([&] { return daemon->requests().back() == "pauseRecording"; }));
    EXPECT_EQ(anonymousGate->accepted.copy().size(), 1U);
    EXPECT_EQ(anonymousGate->accepted.copy().front()->processIdentifier(), ::getpid());
}

TEST_F(SocketTransportTest, ConnectingWhereNobodyListensFails) {
    EXPECT_FALSE(transport->connectToService("com.example.nobody"));
    EXPECT_FALSE(transport->connectToEndpoint(nullptr));
}

TEST_F(SocketTransportTest, TwoHundredClientsAreServedAtOnce) {
    constexpr int kClients = 200;
    // Of several processes, as one process may not hold that many.
    std::vector<pid_t> children;
    for (int i = 0; i < kClients / 25; ++i) {
        const pid_t child = ::fork();
        if (child == 0) {
            // Only what may be called between fork and exit: plain sockets.
            for (int k = 0; k < 25; ++k) {
                const int socket = ::socket(AF_UNIX, SOCK_STREAM, 0);
                sockaddr_un address{};
                address.sun_family = AF_UNIX;
                path.copy(address.sun_path, sizeof(address.sun_path) - 1);
                if (::connect(socket, reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0)
                    ::_exit(1);
            }
            ::pause();
            ::_exit(0);
        }
        children.push_back(child);
    }
    EXPECT_TRUE(eventually([&] { return gate->accepted.copy().size() == kClients; }));
    expectOthersAreServed();
    for (const pid_t child : children) {
        ::kill(child, SIGKILL);
        ::waitpid(child, nullptr, 0);
    }
    EXPECT_TRUE(eventually([&] { return daemon->departures.copy().size() >= 2U * kClients; }));
    expectOthersAreServed();
}

TEST_F(SocketTransportTest, OneProcessMayHoldSoManyConnections) {
    std::vector<std::unique_ptr<RawPeer>> peers;
    for (std::size_t i = 0; i < ipc_bounds::kMostConnectionsOfOneProcess; ++i)
        peers.push_back(std::make_unique<RawPeer>(path));
    const RawPeer oneTooMany(path);
    EXPECT_TRUE(oneTooMany.isCutOff());
    EXPECT_EQ(log.count("IPC: turned away PID " + std::to_string(::getpid()) + ": too many connections"), 1U);
    peers.clear();
    ASSERT_TRUE(eventually(
        [&] { return daemon->departures.copy().size() == 2 * ipc_bounds::kMostConnectionsOfOneProcess; }));
    expectOthersAreServed();
}

TEST_F(SocketTransportTest, ClientThatNeverReadsIsCutOffAtTheBound) {
    RawPeer silent(path);
    silent.authenticate();
    KVClientProxy proxy(acceptedLast());
    const Client other = connect();
    const KVClientProxy otherProxy(acceptedLast(2));
    const Bytes sound(std::size_t{256} << 10);
    for (int i = 0; i < 100; ++i)
        proxy.captureHandlerWithAudioSample(sound, {}, 1, SampleBuffer::Type::microphone, {});
    EXPECT_THAT(cutOffs(), ElementsAre("IPC: cut off PID " + std::to_string(::getpid()) +
                                       ": does not read what is sent to it"));
    other.daemon->pauseRecording();
    EXPECT_TRUE(eventually([&] { return !daemon->requests().empty(); })) << "the others notice nothing";
}

TEST_F(SocketTransportTest, SenderThatIsTooFastIsSlowedDownAndLosesNothing) {
    const Client client = connect();
    constexpr std::size_t kRequests = 2000;
    for (std::size_t i = 0; i < kRequests; ++i)
        client.daemon->pauseRecording();
    EXPECT_TRUE(eventually([&] { return daemon->requests().size() == kRequests; }))
        << daemon->requests().size();
    EXPECT_THAT(cutOffs(), IsEmpty());
}

TEST_F(SocketTransportTest, TooManyOutstandingRequestsEndTheConnection) {
    daemon->keepsStopHandler = true;
    Guarded<std::vector<MovieHandler>> kept;
    daemon->onRequest = [&](const std::string&) {
        kept.with([&](auto& all) { all.push_back(daemon->keptStopHandler.copy()); });
    };
    const Client client = connect();
    for (std::size_t i = 0; i < ipc_bounds::kMostOwedReplies + 2; ++i)
        client.daemon->stopRecordingWithHandler([](const auto&, const auto&) {});
    EXPECT_TRUE(eventually([&] { return *client.invalidations == 1; }));
    EXPECT_EQ(cutOffs().size(), 1U);
}

/// A call of the daemon's interface with a body of its own.
Bytes call(const std::string& member, const std::string& signature, const Array& values,
           std::uint32_t descriptorsClaimed = 0) {
    dbus::Message message;
    message.serial = 1;
    message.flags = dbus::Message::kNoReplyExpected;
    message.path = "/com/quillon/kelvod";
    message.interface = "com.quillon.KelvoKit.KVDaemonProtocol";
    message.member = member;
    message.signature = signature;
    EXPECT_FALSE(dbus::writeBody(values, message));
    for (std::uint32_t i = 0; i < descriptorsClaimed; ++i)
        message.descriptors.emplace_back(::open("/dev/null", O_RDONLY | O_CLOEXEC));
    return dbus::serialize(message);
}

struct Attack {
    std::string name;
    std::function<void(const RawPeer&)> send;
    std::string reason;

    friend void PrintTo(const Attack& attack, std::ostream* out) { *out << attack.name; }
};

std::vector<Attack> attacks() {
    return {
        {"NoAuthentication", [](const RawPeer& peer) { peer.write("GET / HTTP/1.1\r\n"); },
         "authentication failed"},
        {"EndlessAuthentication",
         [](const RawPeer& peer) { peer.write(std::string(1, '\0') + std::string(8000, 'x')); },
         "authentication failed"},
        {"SomebodyElsesIdentity",
         [](const RawPeer& peer) {
             peer.write(std::string(1, '\0') + "AUTH EXTERNAL 3939393939\r\nBEGIN\r\n");
         },
         "authentication failed"},
        {"Garbage",
         [](const RawPeer& peer) {
             peer.authenticate();
             peer.write(std::string(64, 'x'));
         },
         "no little-endian message"},
        {"HugeMessage",
         [](const RawPeer& peer) {
             peer.authenticate();
             peer.write(std::string("l\1\0\1\xff\xff\xff\x07\1\0\0\0\0\0\0\0", 16));
         },
         "message beyond its bound"},
        {"HugeHeader",
         [](const RawPeer& peer) {
             peer.authenticate();
             peer.write(std::string("l\1\0\1\0\0\0\0\1\0\0\0\xff\xff\xff\x03", 16));
         },
         "header beyond its bound"},
        {"WrongType",
         [](const RawPeer& peer) {
             peer.authenticate();
             peer.writeMessage(call("setMicrophoneEnabled", "i", {5}));
         },
         "signature of setMicrophoneEnabled is not what it takes"},
        {"DescriptorThatIsNotSent",
         [](const RawPeer& peer) {
             peer.authenticate();
             peer.writeMessage(call("pauseRecording", "", {}, 1));
         },
         "fewer descriptors than claimed"},
        {"DescriptorOfTheWrongKind",
         [](const RawPeer& peer) {
             peer.authenticate();
             // The endpoint's place in the message, with the null device in it.
             Bytes message = call("startRecordingWindowLayerContextIDs", "au(dd)bbbbbau",
                                  {Array(), Array{1.0, 1.0}, false, false, false, false, false, Array{0}}, 1);
             const std::string_view declared = "au(dd)bbbbbau";
             const auto place = std::search(message.begin(), message.end(), declared.begin(), declared.end(),
                                            [](std::byte a, char b) { return static_cast<char>(a) == b; });
             *(place + 12) = static_cast<std::byte>('h');
             const UniqueFd null(::open("/dev/null", O_RDONLY | O_CLOEXEC));
             peer.writeMessage(message, null.get());
         },
         "startRecordingWindowLayerContextIDs: endpoint that is none: Bad message"},
    };
}

class AttackTest : public SocketTransportTest, public testing::WithParamInterface<Attack> {};

TEST_P(AttackTest, EndsThatConnectionWithOneLineAndNobodyElses) {
    const Client bystander = connect();
    const RawPeer peer(path);
    GetParam().send(peer);
    EXPECT_TRUE(peer.isCutOff());
    ASSERT_EQ(cutOffs().size(), 1U);
    EXPECT_THAT(cutOffs().front(), testing::HasSubstr(GetParam().reason));
    EXPECT_THAT(daemon->requests(), IsEmpty());
    bystander.daemon->pauseRecording();
    EXPECT_TRUE(eventually([&] { return daemon->requests().size() == 1; }));
    EXPECT_EQ(*bystander.invalidations, 0);
}

std::string attackName(const testing::TestParamInfo<Attack>& info) {
    return info.param.name;
}
INSTANTIATE_TEST_SUITE_P(All, AttackTest, testing::ValuesIn(attacks()), attackName);

}  // namespace
}  // namespace kelvo
