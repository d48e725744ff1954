#include "SocketFixture.h"
#include "ipc/KVClientProxy.h"
#include "support/DaemonRequests.h"

#include <csignal>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>

namespace kelvo {
namespace {

using test::DaemonRequest;
using test::eventually;
using testing::ElementsAre;
using testing::IsEmpty;

using SocketTransportTest = test::SocketFixture;

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

TEST_F(SocketTransportTest, ConnectingToOneThatTakesNobodyFailsInTheEnd) {
    const std::string place = root.path() + "/asleep";
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    place.copy(address.sun_path, sizeof(address.sun_path) - 1);
    const UniqueFd asleep(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    ASSERT_EQ(::bind(asleep.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
    ASSERT_EQ(::listen(asleep.get(), 0), 0);
    const auto waiting = transport->connectToSocket(place);
    ASSERT_TRUE(waiting);
    const auto refused = transport->connectToSocket(place);
    ASSERT_FALSE(refused);
    EXPECT_EQ(refused.error().code(), ETIMEDOUT);
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

TEST_F(SocketTransportTest, SenderThatIsTooFastIsSlowedDownAndLosesNothing) {
    const Client client = connect();
    constexpr std::size_t kRequests = 2000;
    for (std::size_t i = 0; i < kRequests; ++i)
        client.daemon->pauseRecording();
    EXPECT_TRUE(eventually([&] { return daemon->requests().size() == kRequests; }))
        << daemon->requests().size();
    EXPECT_THAT(cutOffs(), IsEmpty());
}

}  // namespace
}  // namespace kelvo
