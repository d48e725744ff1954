#include "ConnectionManagerFixture.h"
#include "ipc/KVClientProxy.h"
#include "ipc/KVClientProxyFactory.h"
#include "support/ClientCallbacks.h"

#include <array>
#include <string>

namespace kelvo {
namespace {

using test::ClientCallback;
using test::kCallbackError;
using testing::ElementsAre;
using testing::IsEmpty;

/// The daemon keeps the ends of its clients' connections here.
class ProxyFixture : public test::ConnectionManagerFixture, public IPCListenerDelegate {
  protected:
    ProxyFixture() { listener->setDelegate(std::shared_ptr<IPCListenerDelegate>(anchor, this)); }

    bool listenerShouldAcceptNewConnection(IPCListener&, const IPCConnectionRef& connection) override {
        connection->setExported(interfaceOf<KVDaemonProtocol>(),
                                std::make_shared<ProtocolDispatcher<KVDaemonProtocol>>(manager));
        connection->setRemoteInterface(interfaceOf<KVClientProtocol>());
        connection->setInterruptionHandler([this] { ++interruptions; });
        connection->setInvalidationHandler([this] { ++invalidations; });
        connection->resume();
        accepted.push_back(connection);
        return true;
    }

    std::shared_ptr<int> anchor = std::make_shared<int>(0);
    std::vector<IPCConnectionRef> accepted;
    std::atomic<int> interruptions{0};
    std::atomic<int> invalidations{0};
};

class CallbackTest : public ProxyFixture, public testing::WithParamInterface<ClientCallback> {};

TEST_P(CallbackTest, SingleProxyLogsAndSends) {
    const Client client = connect(10);
    KVClientProxy proxy(accepted.front());
    GetParam().send(proxy);
    device.settle();
    EXPECT_EQ(log.count(GetParam().text), 1U);
    EXPECT_THAT(client.callbacks->messages(), ElementsAre(GetParam().name));
}

TEST_P(CallbackTest, SingleProxyLogsAFailedDelivery) {
    const Client client = connect(10);
    KVClientProxy proxy(accepted.front());
    client.connection->invalidate();
    device.settle();
    GetParam().send(proxy);
    EXPECT_EQ(log.count(GetParam().text), 1U);
    EXPECT_EQ(log.count(LogLevel::error, GetParam().failureText), 1U);
}

TEST_P(CallbackTest, MultipleProxySendsToEveryoneOrDrops) {
    const Client one = connect(10);
    const Client two = connect(11);
    KVMultipleClientProxy proxy;
    proxy.handleNewConnection(accepted[0]);
    proxy.handleNewConnection(accepted[1]);
    if (!GetParam().isOfferedToEveryone) return;
    GetParam().send(proxy);
    device.settle();
    if (GetParam().fanOutText.empty()) {
        EXPECT_THAT(one.callbacks->messages(), IsEmpty());
        EXPECT_THAT(linesAbout("KVMultipleClientProxy"), IsEmpty());
    } else {
        EXPECT_THAT(one.callbacks->messages(), ElementsAre(GetParam().name));
        EXPECT_THAT(two.callbacks->messages(), ElementsAre(GetParam().name));
        EXPECT_THAT(linesAbout("KVMultipleClientProxy"), ElementsAre(GetParam().fanOutText));
    }
}

TEST_P(CallbackTest, MultipleProxyLogsAFailedDelivery) {
    if (GetParam().fanOutFailure.empty()) return;
    const Client client = connect(10);
    KVMultipleClientProxy proxy;
    proxy.handleNewConnection(accepted.front());
    client.connection->invalidate();
    device.settle();
    GetParam().send(proxy);
    EXPECT_EQ(log.count(LogLevel::error, GetParam().fanOutFailure), 1U);
}

std::string callbackName(const testing::TestParamInfo<ClientCallback>& info) {
    return info.param.name;
}
INSTANTIATE_TEST_SUITE_P(All, CallbackTest, testing::ValuesIn(test::clientCallbacks()), callbackName);

class KVClientProxyTest : public ProxyFixture {};

TEST_F(KVClientProxyTest, StateUpdateOnlyLogs) {
    const Client client = connect(10);
    KVClientProxy proxy(accepted.front());
    proxy.updateScreenRecordingState();
    device.settle();
    EXPECT_EQ(log.count("KVClientProxy:updateScreenRecordingState"), 1U);
    EXPECT_THAT(client.callbacks->messages(), IsEmpty());
}

TEST_F(KVClientProxyTest, EveryArgumentArrivesAsItWasSent) {
    const Client client = connect(10);
    KVClientProxy proxy(accepted.front());
    proxy.recordingDidStopWithError(kCallbackError, std::nullopt);
    proxy.recordingDidStopWithError(std::nullopt, URL("file:///m"));
    proxy.updateBroadcastServiceInfo({{"a", Array{1, "x"}}});
    const auto surface = std::make_shared<KVIOSurfaceObject>();
    surface->setIOSurface(*VideoSurface::create(VideoSurface::Geometry::packed(4, 2)));
    const TimingRecord timing{{1, 30, 1, 0}, {5, 30, 1, 0}, {}};
    proxy.captureHandlerWithSample(surface, bytesOfRecord(timing));
    const Bytes sound{std::byte{1}, std::byte{2}, std::byte{3}, std::byte{4}};
    const auto format = bytesOfRecord(AudioFormatRecord::signed16(44100, 2));
    proxy.captureHandlerWithAudioSample(sound, format, 1, SampleBuffer::Type::applicationAudio,
                                        bytesOfRecord(timing));
    device.settle();
    using Stop = test::FakeClientProxy::Stop;
    EXPECT_THAT(client.callbacks->stops.copy(),
                ElementsAre(Stop{kCallbackError, std::nullopt}, Stop{std::nullopt, URL("file:///m")}));
    EXPECT_THAT(client.callbacks->serviceInfos.copy(), ElementsAre(Dictionary{{"a", Array{1, "x"}}}));
    const auto frame = client.callbacks->videoSamples.copy().at(0);
    ASSERT_NE(frame.surface->ioSurface(), nullptr);
    EXPECT_EQ(frame.surface->ioSurface()->geometry(), surface->ioSurface()->geometry());
    EXPECT_EQ(recordFromBytes<TimingRecord>(frame.timingData), timing);
    const auto audio = client.callbacks->audioSamples.copy().at(0);
    EXPECT_EQ(audio.audioData, sound);
    EXPECT_EQ(audio.absdData, format);
    EXPECT_EQ(audio.itemCount, 1);
    EXPECT_EQ(audio.bufferType, SampleBuffer::Type::applicationAudio);
}

/// A connection that hands over the frames of surfaces which are eight wide.
class ConnectionWithAWayForFrames : public SimulatedConnection {
  public:
    ConnectionWithAWayForFrames() : SimulatedConnection(10, Dictionary()) {
        setRemoteInterface(interfaceOf<KVClientProtocol>());
    }
    bool handOver(const IPCFrame& frame) override {
        if (!frame.surface || frame.surface->width() != 8) return false;
        methods.push_back(remoteInterface()->methods.at(frame.method).name);
        records.emplace_back(frame.record.begin(), frame.record.end());
        return true;
    }
    std::vector<std::string> methods;
    std::vector<Bytes> records;
};

TEST_F(KVClientProxyTest, FrameThatIsHandedOverIsNotSent) {
    const auto connection = std::make_shared<ConnectionWithAWayForFrames>();
    KVClientProxy proxy(connection);
    const auto object = std::make_shared<KVIOSurfaceObject>();
    object->setIOSurface(*VideoSurface::create(VideoSurface::Geometry::packed(8, 2)));
    const auto timing = bytesOfRecord(TimingRecord{{1, 30, 1, 0}, {5, 30, 1, 0}, {}});
    proxy.captureHandlerWithSample(object, timing);
    EXPECT_THAT(connection->methods, ElementsAre("captureHandlerWithSample"));
    EXPECT_THAT(connection->records, ElementsAre(Bytes(timing.begin(), timing.end())));
    EXPECT_EQ(log.count("KVClientProxy:captureHandlerWithSample:"), 1U);
    EXPECT_THAT(linesAbout("error getting remote proxy"), IsEmpty());
    object->setIOSurface(*VideoSurface::create(VideoSurface::Geometry::packed(4, 2)));
    proxy.captureHandlerWithSample(object, timing);
    EXPECT_EQ(connection->methods.size(), 1U);
    EXPECT_THAT(linesAbout("error getting remote proxy"), testing::SizeIs(1)) << "sent, but it has no peer";
}

TEST_F(KVClientProxyTest, GoingAwayEndsTheConnectionWithoutItsHandlers) {
    const Client client = connect(10);
    { const KVClientProxy proxy(accepted.front()); }
    device.settle();
    EXPECT_EQ(interruptions, 0);
    EXPECT_EQ(invalidations, 0);
    client.daemon->pauseRecording();
    EXPECT_THAT(client.errors->copy(), ElementsAre(ENOTCONN));
}

TEST_F(KVClientProxyTest, GoingAwayWithoutAConnectionLeavesItAlone) {
    const Client client = connect(10);
    {
        KVClientProxy proxy(accepted.front());
        proxy.setConnection(nullptr);
        EXPECT_EQ(proxy.connection(), nullptr);
        proxy.recordingDidPause();
    }
    client.daemon->pauseRecording();
    device.settle();
    EXPECT_THAT(client.errors->copy(), IsEmpty());
}

class KVMultipleClientProxyTest : public ProxyFixture {
  protected:
    KVMultipleClientProxy proxy;
};

TEST_F(KVMultipleClientProxyTest, BeginsEmpty) {
    EXPECT_THAT(proxy.connectionSet(), IsEmpty());
    EXPECT_EQ(proxy.currentConnectionProcessIdentifier(), 0);
    EXPECT_EQ(KVMultipleClientProxy::clientProxy(), KVMultipleClientProxy::clientProxy());
}

TEST_F(KVMultipleClientProxyTest, SameConnectionIsKeptOnce) {
    connect(10);
    proxy.handleNewConnection(accepted.front());
    proxy.handleNewConnection(accepted.front());
    EXPECT_THAT(proxy.connectionSet(), ElementsAre(accepted.front()));
}

TEST_F(KVMultipleClientProxyTest, StateUpdateWithOneClientSendsNothing) {
    const Client client = connect(10);
    proxy.handleNewConnection(accepted.front());
    proxy.updateScreenRecordingState();
    device.settle();
    EXPECT_EQ(log.count("KVMultipleClientProxy:updateScreenRecordingState:"), 1U);
    EXPECT_THAT(client.callbacks->messages(), IsEmpty());
}

TEST_F(KVMultipleClientProxyTest, StateUpdateReachesOnlyTheClientThatDidNotCauseIt) {
    const Client one = connect(10);
    const Client two = connect(11);
    proxy.handleNewConnection(accepted[0]);
    proxy.handleNewConnection(accepted[1]);
    proxy.setCurrentConnectionProcessIdentifier(10);
    proxy.updateScreenRecordingState();
    device.settle();
    EXPECT_THAT(one.callbacks->messages(), IsEmpty());
    EXPECT_THAT(two.callbacks->messages(), ElementsAre("updateScreenRecordingState"));
    two.connection->invalidate();
    device.settle();
    proxy.updateScreenRecordingState();
    EXPECT_EQ(log.count("KVMultipleClientProxy:updateScreenRecordingState: error getting remote proxy: 107"),
              1U);
}

TEST_F(KVMultipleClientProxyTest, ResetEndsTheProcessSilentlyAndFanOutsStillTryIt) {
    const Client gone = connect(10);
    const Client stays = connect(11);
    proxy.handleNewConnection(accepted[0]);
    proxy.handleNewConnection(accepted[1]);
    proxy.resetConnectionWithProcessIdentifier(10);
    device.settle();
    EXPECT_EQ(interruptions + invalidations, 0);
    EXPECT_EQ(proxy.connectionSet().size(), 2U);
    proxy.recordingTimerDidUpdate("00:01");
    device.settle();
    EXPECT_EQ(log.count("KVMultipleClientProxy:recordingTimerDidUpdate: error getting remote proxy: 107"),
              1U);
    EXPECT_THAT(stays.callbacks->timerTexts.copy(), ElementsAre("00:01"));
    EXPECT_THAT(gone.callbacks->messages(), IsEmpty());
}

TEST_F(KVMultipleClientProxyTest, PausingIsNotOffered) {
    const Client client = connect(10);
    proxy.handleNewConnection(accepted.front());
    proxy.recordingDidPause();
    proxy.recordingShouldResume();
    device.settle();
    EXPECT_THAT(client.callbacks->messages(), IsEmpty());
    EXPECT_EQ(log.count("KVMultipleClientProxy: recordingDidPause is not offered"), 1U);
    EXPECT_EQ(log.count("KVMultipleClientProxy: recordingShouldResume is not offered"), 1U);
}

using KVClientProxyFactoryTest = ProxyFixture;

TEST_F(KVClientProxyFactoryTest, PrivilegedClientsShareOneProxy) {
    connect(10, {{"com.quillon.private.kelvo-kit", true}});
    const auto proxy = KVClientProxyFactory::clientProxyWithNewConnection(accepted.front());
    EXPECT_EQ(proxy, KVMultipleClientProxy::clientProxy());
    EXPECT_EQ(KVClientProxyFactory::clientProxyWithNewConnection(accepted.front()), proxy);
    const auto set = KVMultipleClientProxy::clientProxy()->connectionSet();
    EXPECT_EQ(std::ranges::count(set, accepted.front()), 1);
}

TEST_F(KVClientProxyFactoryTest, OtherClientsGetAProxyOfTheirOwn) {
    connect(10, {{"com.quillon.private.kelvo-kit", false}});
    connect(11);
    for (const Value& value : {Value(1), Value(0.5), Value("true")})
        connect(12, {{"com.quillon.private.kelvo-kit", value}});
    ASSERT_EQ(accepted.size(), 5U);
    for (const IPCConnectionRef& connection : accepted) {
        const auto proxy = KVClientProxyFactory::clientProxyWithNewConnection(connection);
        const auto single = std::dynamic_pointer_cast<KVClientProxy>(proxy);
        ASSERT_NE(single, nullptr);
        EXPECT_EQ(single->connection(), connection);
    }
}

TEST_F(KVClientProxyTest, MovieIsGivenWhereTheClientFindsIt) {
    const Client client = connect(10);
    std::static_pointer_cast<SimulatedConnection>(accepted.front())->peerSuffix = "?peer";
    KVClientProxy proxy(accepted.front());
    proxy.recordingDidStopWithError(std::nullopt, URL("file:///m"));
    device.settle();
    ASSERT_EQ(client.callbacks->stops.copy().size(), 1U);
    EXPECT_EQ(client.callbacks->stops.copy().front().movieURL, URL("file:///m?peer"));
}

TEST_F(KVMultipleClientProxyTest, MovieIsGivenWhereEachClientFindsIt) {
    const std::array clients{connect(10), connect(11)};
    const std::array<std::string, 2> suffixes{"?one", "?other"};
    for (std::size_t i = 0; i < 2; ++i) {
        std::static_pointer_cast<SimulatedConnection>(accepted[i])->peerSuffix = suffixes[i];
        proxy.handleNewConnection(accepted[i]);
    }
    proxy.recordingDidStopWithError(std::nullopt, URL("file:///m"));
    proxy.recordingDidStopWithError(kCallbackError, std::nullopt);
    device.settle();
    using Stop = test::FakeClientProxy::Stop;
    for (std::size_t i = 0; i < 2; ++i) {
        EXPECT_THAT(clients[i].callbacks->stops.copy(),
                    ElementsAre(Stop{std::nullopt, URL("file:///m" + suffixes[i])},
                                Stop{kCallbackError, std::nullopt}));
    }
}

/// No peer has that number; the simulated device can give it all the same.
TEST_F(KVMultipleClientProxyTest, ResetOfProcessZeroTakesNothingOutOfTheSet) {
    const Client nobody = connect(0);
    const Client stays = connect(10);
    proxy.handleNewConnection(accepted[0]);
    proxy.handleNewConnection(accepted[1]);
    proxy.resetConnectionWithProcessIdentifier(0);
    EXPECT_THAT(proxy.connectionSet(), ElementsAre(accepted[0], accepted[1]));
    proxy.recordingTimerDidUpdate("00:01");
    device.settle();
    EXPECT_THAT(nobody.callbacks->messages(), IsEmpty());
    EXPECT_THAT(stays.callbacks->timerTexts.copy(), ElementsAre("00:01"));
}

}  // namespace
}  // namespace kelvo
