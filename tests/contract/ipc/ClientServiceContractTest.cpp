#include "IPCWorlds.h"
#include "ipc/KVBroadcastConfigurationCoding.h"
#include "ipc/KVClientProtocolTable.h"
#include "ipc/KVClientProxy.h"
#include "ipc/KVClientProxyFactory.h"
#include "ipc/KVConnectionManager.h"
#include "ipc/KVMultipleClientProxy.h"
#include "ipc/KVRemoteDaemon.h"
#include "support/FakeClientProxy.h"
#include "support/FakeDaemon.h"
#include "support/LogRecorder.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;

constexpr const char* kService = "com.quillon.kelvod";
constexpr const char* kPicker = "com.quillon.KelvoKit.KVBroadcastActivityViewControllerExtension";
constexpr const char* kSystemRight = "com.quillon.private.kelvo-kit";
constexpr const char* kSetupRight = "com.quillon.private.kelvo-kit.can-setup-broadcast";
const ClientProgram kPrivileged{"com.quillon.plinth", {{kSystemRight, true}}};
const ClientProgram kOrdinary{"com.example.app", {}};

/// Remembers the daemon's ends of what the connection manager accepted.
class RememberingGate : public IPCListenerDelegate {
  public:
    explicit RememberingGate(std::shared_ptr<KVConnectionManager> manager) : manager_(std::move(manager)) {}
    bool listenerShouldAcceptNewConnection(IPCListener& listener,
                                           const IPCConnectionRef& connection) override {
        const bool isKept = manager_->listenerShouldAcceptNewConnection(listener, connection);
        accepted.with([&](auto& all) { all.push_back(connection); });
        return isKept;
    }
    Guarded<std::vector<IPCConnectionRef>> accepted;

  private:
    const std::shared_ptr<KVConnectionManager> manager_;
};

/// The connection manager before a fake daemon, with clients that are processes of their own.
template <typename World>
class ClientServiceContract : public testing::Test {
  protected:
    struct Client {
        std::int32_t processIdentifier = 0;
        IPCConnectionRef connection;
        IPCConnectionRef daemonsEnd;
        std::shared_ptr<FakeClientProxy> callbacks = std::make_shared<FakeClientProxy>();
        std::shared_ptr<KVRemoteDaemon> daemon;
    };

    ClientServiceContract() {
        manager->setDelegate(daemon);
        listener->setDelegate(gate);
        listener->resume();
    }

    /// What ends now is nobody's business any more: the next test records the log.
    ~ClientServiceContract() override {
        for (const IPCConnectionRef& each : gate->accepted.copy()) {
            each->setInterruptionHandler(nullptr);
            each->setInvalidationHandler(nullptr);
        }
    }

    Client connect(const ClientProgram& program) {
        const std::size_t before = gate->accepted.copy().size();
        const ConnectedProcess process = world.connectFrom(program, kService);
        Client client;
        client.processIdentifier = process.processIdentifier;
        client.connection = process.connection;
        client.connection->setRemoteInterface(interfaceOf<KVDaemonProtocol>());
        client.connection->setExported(
            interfaceOf<KVClientProtocol>(),
            std::make_shared<ProtocolDispatcher<KVClientProtocol>>(client.callbacks));
        client.connection->resume();
        client.daemon = std::make_shared<KVRemoteDaemon>(*client.connection, nullptr);
        EXPECT_TRUE(world.comesTrue([&] { return gate->accepted.copy().size() > before; }));
        client.daemonsEnd = gate->accepted.copy().back();
        return client;
    }
    /// Everything that was sent before it has been served.
    void pauseAndWait(const Client& client) {
        const std::size_t before = daemon->requests().size();
        client.daemon->pauseRecording();
        ASSERT_TRUE(world.comesTrue([&] { return daemon->requests().size() > before; }));
    }
    std::vector<std::string> linesAbout(const std::string& part) const {
        std::vector<std::string> lines = log.texts();
        std::erase_if(lines, [&](const std::string& line) { return line.find(part) == std::string::npos; });
        return lines;
    }
    bool hears(const Client& client, std::size_t count) {
        return world.comesTrue([&] { return client.callbacks->messages().size() == count; });
    }
    void setUpBroadcast(const Client& client, const Bytes& configuration, ErrorHandler handler) {
        client.daemon->setupBroadcastWithHostBundleID("host", "extension", configuration, {},
                                                      std::move(handler));
    }

    LogRecorder log;
    World world;
    std::shared_ptr<IPCTransport> transport = world.transport();
    std::shared_ptr<FakeDaemon> daemon = std::make_shared<FakeDaemon>();
    std::shared_ptr<KVConnectionManager> manager = std::make_shared<KVConnectionManager>(
        transport, std::make_shared<KVLocalization>(world.bundles(), world.languages()));
    std::shared_ptr<RememberingGate> gate = std::make_shared<RememberingGate>(manager);
    std::shared_ptr<IPCListener> listener = transport->createListener(kService);
    KVMultipleClientProxy everyone;
};

TYPED_TEST_SUITE(ClientServiceContract, IPCWorlds, IPCWorldNames);

TYPED_TEST(ClientServiceContract, PickerIsServedButItsComingAndGoingReachNoOne) {
    const auto picker = this->connect({kPicker, {}});
    const auto other = this->connect(kOrdinary);
    this->pauseAndWait(picker);
    picker.connection->invalidate();
    other.connection->invalidate();
    ASSERT_TRUE(this->world.comesTrue([&] { return this->daemon->departures.copy().size() == 2; }));
    EXPECT_THAT(this->daemon->arrivals.copy(), ElementsAre(Pair("com.example.app", other.processIdentifier)));
    EXPECT_THAT(this->daemon->departures.copy(),
                testing::Each(Pair("com.example.app", other.processIdentifier)));
}

TYPED_TEST(ClientServiceContract, SetUpWithNeitherRightIsRefusedAndNothingElseHappens) {
    const auto client = this->connect({"com.example.app", {{kSystemRight, false}}});
    Guarded<std::vector<OptionalError>> answers;
    this->setUpBroadcast(client, {}, [&](const OptionalError& error) {
        answers.with([&](auto& all) { all.push_back(error); });
    });
    ASSERT_TRUE(this->world.comesTrue([&] { return answers.copy().size() == 1; }));
    EXPECT_EQ(answers.copy()[0], KVError("com.quillon.KelvoKit.KVRecordingErrorDomain", -5819));
    this->pauseAndWait(client);
    EXPECT_THAT(this->daemon->requests(), ElementsAre("pauseRecording"));
}

TYPED_TEST(ClientServiceContract, EitherRightLetsTheSetUpReachTheDaemon) {
    for (const char* right : {kSystemRight, kSetupRight}) {
        const auto client = this->connect({"com.example.app", {{right, true}}});
        std::atomic<int> answers{0};
        this->setUpBroadcast(client, {}, [&](const OptionalError& error) { answers += error ? 100 : 1; });
        EXPECT_TRUE(this->world.comesTrue([&] { return answers == 1; })) << right;
    }
    EXPECT_EQ(this->daemon->requests().size(), 2U);
}

TYPED_TEST(ClientServiceContract, SetUpWithoutRightsAndHandlerOnlyLogs) {
    const auto client = this->connect(kOrdinary);
    this->setUpBroadcast(client, {}, nullptr);
    this->pauseAndWait(client);
    EXPECT_THAT(this->daemon->requests(), ElementsAre("pauseRecording"));
    EXPECT_THAT(this->linesAbout("setupBroadcast"),
                ElementsAre("KVConnectionManager: setupBroadcastWithHostBundleID",
                            "KVConnectionManager: setupBroadcastWithHostBundleID failed because client "
                            "doesn't have entitlements to setup broadcast"));
}

TYPED_TEST(ClientServiceContract, CurrentProcessIsThatOfTheLatestRequestOtherThanASetUp) {
    const auto a = this->connect(kOrdinary);
    const auto b = this->connect(kOrdinary);
    const auto c = this->connect({"com.example.setup", {{kSetupRight, true}}});
    const auto& shared = KVMultipleClientProxy::clientProxy();
    this->pauseAndWait(a);
    EXPECT_EQ(shared->currentConnectionProcessIdentifier(), a.processIdentifier);
    this->pauseAndWait(b);
    EXPECT_EQ(shared->currentConnectionProcessIdentifier(), b.processIdentifier);
    this->setUpBroadcast(c, {}, nullptr);
    ASSERT_TRUE(this->world.comesTrue([&] { return this->daemon->requests().size() == 3; }));
    EXPECT_EQ(shared->currentConnectionProcessIdentifier(), b.processIdentifier);
    EXPECT_EQ(this->manager->getCurrentConnection(), b.daemonsEnd);
}

TYPED_TEST(ClientServiceContract, PeerWithoutABundleIsAcceptedAndItsEndCarriesNoIdentifier) {
    const auto client = this->connect({});
    this->pauseAndWait(client);
    client.connection->invalidate();
    ASSERT_TRUE(this->world.comesTrue([&] { return this->daemon->departures.copy().size() == 2; }));
    EXPECT_THAT(this->daemon->arrivals.copy(), ElementsAre(Pair(std::nullopt, client.processIdentifier)));
    EXPECT_THAT(this->daemon->departures.copy(), testing::Each(Pair(std::nullopt, client.processIdentifier)));
    EXPECT_THAT(this->linesAbout("connection IN"),
                ElementsAre("connection INTERRUPTED", "connection INVALID"));
}

TYPED_TEST(ClientServiceContract, PrivilegedClientsShareOneProxyThatHoldsEachConnectionOnce) {
    const auto shell = this->connect(kPrivileged);
    const auto panel = this->connect(kPrivileged);
    const auto ordinary = this->connect(kOrdinary);
    const auto proxyOf = [](const auto& client) {
        return KVClientProxyFactory::clientProxyWithNewConnection(client.daemonsEnd);
    };
    const ClientProxyRef shared = proxyOf(shell);
    EXPECT_EQ(shared, KVMultipleClientProxy::clientProxy());
    EXPECT_EQ(proxyOf(panel), shared);
    EXPECT_EQ(proxyOf(shell), shared);
    const auto set = KVMultipleClientProxy::clientProxy()->connectionSet();
    EXPECT_EQ(std::ranges::count(set, shell.daemonsEnd), 1);
    EXPECT_EQ(std::ranges::count(set, panel.daemonsEnd), 1);
    EXPECT_NE(proxyOf(ordinary), shared);
    EXPECT_NE(proxyOf(ordinary), proxyOf(ordinary));
}

TYPED_TEST(ClientServiceContract, StateUpdateReachesOnlyWhoDidNotCauseItAndNobodyWhileThereIsOne) {
    const auto one = this->connect(kPrivileged);
    this->everyone.handleNewConnection(one.daemonsEnd);
    this->everyone.updateScreenRecordingState();
    const auto two = this->connect(kPrivileged);
    this->everyone.handleNewConnection(two.daemonsEnd);
    this->everyone.setCurrentConnectionProcessIdentifier(one.processIdentifier);
    this->everyone.updateScreenRecordingState();
    this->everyone.recordingTimerDidUpdate("00:01");
    ASSERT_TRUE(this->hears(one, 1));
    ASSERT_TRUE(this->hears(two, 2));
    EXPECT_THAT(one.callbacks->messages(), ElementsAre("recordingTimerDidUpdate"));
    EXPECT_THAT(two.callbacks->messages(),
                ElementsAre("updateScreenRecordingState", "recordingTimerDidUpdate"));
}

TYPED_TEST(ClientServiceContract, PrivilegedClientThatIsGoneIsStillTriedAndTheFailureLogged) {
    const auto gone = this->connect(kPrivileged);
    const auto other = this->connect(kPrivileged);
    this->everyone.handleNewConnection(gone.daemonsEnd);
    this->everyone.handleNewConnection(other.daemonsEnd);
    gone.connection->invalidate();
    ASSERT_TRUE(this->world.comesTrue([&] { return this->daemon->departures.copy().size() == 2; }));
    this->everyone.resetConnectionWithProcessIdentifier(gone.processIdentifier);
    EXPECT_EQ(this->everyone.connectionSet().size(), 2U);
    this->everyone.recordingTimerDidUpdate("00:01");
    EXPECT_TRUE(this->hears(other, 1));
    EXPECT_EQ(
        this->log.count("KVMultipleClientProxy:recordingTimerDidUpdate: error getting remote proxy: 107"),
        1U);
}

TYPED_TEST(ClientServiceContract, ResetEndsALivingProcessWithoutItsHandlers) {
    const auto client = this->connect(kPrivileged);
    this->everyone.handleNewConnection(client.daemonsEnd);
    std::atomic<bool> isInterrupted{false};
    client.connection->setInterruptionHandler([&] { isInterrupted = true; });
    this->everyone.resetConnectionWithProcessIdentifier(client.processIdentifier + 1);
    this->pauseAndWait(client);
    this->everyone.resetConnectionWithProcessIdentifier(client.processIdentifier);
    EXPECT_TRUE(this->world.comesTrue([&] { return isInterrupted.load(); }));
    this->pauseAndWait(this->connect(kOrdinary));
    EXPECT_THAT(this->daemon->departures.copy(), IsEmpty());
    client.connection->setInterruptionHandler(nullptr);
}

TYPED_TEST(ClientServiceContract, ServiceInformationAndCapturesForEveryoneAreDropped) {
    const auto client = this->connect(kPrivileged);
    this->everyone.handleNewConnection(client.daemonsEnd);
    this->everyone.updateBroadcastServiceInfo({{"a", 1}});
    this->everyone.captureHandlerWithSample(std::make_shared<KVIOSurfaceObject>(), {});
    this->everyone.captureHandlerWithAudioSample(Bytes(8), {}, 2, SampleBuffer::Type::microphone, {});
    EXPECT_THAT(this->linesAbout("KVMultipleClientProxy"), IsEmpty());
    this->everyone.recordingTimerDidUpdate("behind");
    ASSERT_TRUE(this->hears(client, 1));
    EXPECT_THAT(client.callbacks->messages(), ElementsAre("recordingTimerDidUpdate"));
}

TYPED_TEST(ClientServiceContract, StateUpdateForOneClientOnlyLogs) {
    const auto client = this->connect(kOrdinary);
    KVClientProxy proxy(client.daemonsEnd);
    proxy.updateScreenRecordingState();
    proxy.recordingDidPause();
    ASSERT_TRUE(this->hears(client, 1));
    EXPECT_THAT(client.callbacks->messages(), ElementsAre("recordingDidPause"));
    EXPECT_EQ(this->log.count("KVClientProxy:updateScreenRecordingState"), 1U);
}

TYPED_TEST(ClientServiceContract, ConfigurationWithoutPropertiesArrivesWithoutThem) {
    const auto client = this->connect({"com.example.setup", {{kSetupRight, true}}});
    this->setUpBroadcast(client, archivedData<KVBroadcastConfigurationCoding>(KVBroadcastConfiguration()),
                         nullptr);
    ASSERT_TRUE(this->world.comesTrue([&] { return this->daemon->arguments().size() == 1; }));
    const Array arguments = this->daemon->arguments()[0];
    const auto decoded = unarchived<KVBroadcastConfigurationCoding>(*arguments[2].template as<Bytes>());
    ASSERT_TRUE(decoded);
    EXPECT_EQ(decoded->clipDuration(), 0.0);
    EXPECT_FALSE(decoded->videoCompressionProperties());
}

TYPED_TEST(ClientServiceContract, SurfaceObjectArrivesWithItsSurfaceOrWithoutOne) {
    const auto client = this->connect(kOrdinary);
    KVClientProxy proxy(client.daemonsEnd);
    const auto object = std::make_shared<KVIOSurfaceObject>();
    proxy.captureHandlerWithSample(object, {});
    const VideoSurfaceRef surface = *VideoSurface::create(VideoSurface::Geometry::packed(4, 2));
    surface->writablePixels()[5] = std::byte{77};
    object->setIOSurface(surface);
    object->setIOSurface(surface);
    EXPECT_EQ(surface.use_count(), 2) << "the same surface is held once";
    proxy.captureHandlerWithSample(object, {});
    ASSERT_TRUE(this->hears(client, 2));
    const auto samples = client.callbacks->videoSamples.copy();
    EXPECT_EQ(samples[0].surface->ioSurface(), nullptr);
    ASSERT_NE(samples[1].surface->ioSurface(), nullptr);
    EXPECT_EQ(samples[1].surface->ioSurface()->geometry(), surface->geometry());
    EXPECT_EQ(samples[1].surface->ioSurface()->pixels()[5], std::byte{77});
}

TYPED_TEST(ClientServiceContract, SurfaceThatWasSentIsHeldByNobodyButItsReceiver) {
    const auto client = this->connect(kOrdinary);
    KVClientProxy proxy(client.daemonsEnd);
    const VideoSurfaceRef surface = *VideoSurface::create(VideoSurface::Geometry::packed(4, 2));
    {
        const auto object = std::make_shared<KVIOSurfaceObject>();
        object->setIOSurface(surface);
        proxy.captureHandlerWithSample(object, {});
    }
    ASSERT_TRUE(this->hears(client, 1));
    client.callbacks->videoSamples.set({});
    EXPECT_TRUE(this->world.comesTrue([&] { return surface.use_count() == 1; }));
}

}  // namespace
}  // namespace kelvo::test
