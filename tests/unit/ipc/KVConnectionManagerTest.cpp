#include "ConnectionManagerFixture.h"
#include "ipc/KVUserErrors.h"
#include "support/DaemonRequests.h"

namespace kelvo {
namespace {

using test::DaemonRequest;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;

constexpr const char* kPicker = "com.quillon.KelvoKit.KVBroadcastActivityViewControllerExtension";
constexpr const char* kSystemRight = "com.quillon.private.kelvo-kit";
constexpr const char* kSetupRight = "com.quillon.private.kelvo-kit.can-setup-broadcast";

class KVConnectionManagerTest : public test::ConnectionManagerFixture {};

TEST_F(KVConnectionManagerTest, QueueIsOneForTheProcess) {
    EXPECT_EQ(KVConnectionManager::connectionManagerQueue().label(), "com.kelvokit.connectionManagerQueue");
    EXPECT_EQ(&KVConnectionManager::connectionManagerQueue(), &KVConnectionManager::connectionManagerQueue());
}

TEST_F(KVConnectionManagerTest, AcceptedClientIsLoggedAndReportedBeforeItCanSend) {
    addApplication(10, "com.example.app");
    connect(10);
    EXPECT_THAT(log.texts(), testing::IsSupersetOf({"KVRecordingManager: shouldAcceptNewConnection:",
                                                    "accepted client connection PID: 10"}));
    EXPECT_THAT(daemon->arrivals.copy(), ElementsAre(Pair("com.example.app", 10)));
}

TEST_F(KVConnectionManagerTest, PeerWithoutABundleIsAcceptedAndItsEndCarriesNoIdentifier) {
    const Client client = connect(11);
    EXPECT_THAT(daemon->arrivals.copy(), ElementsAre(Pair(std::nullopt, 11)));
    client.connection->invalidate();
    device.settle();
    EXPECT_THAT(daemon->departures.copy(), ElementsAre(Pair(std::nullopt, 11), Pair(std::nullopt, 11)));
}

TEST_F(KVConnectionManagerTest, LostClientIsReportedForItsInterruptionAndForItsInvalidation) {
    addApplication(10, "com.example.app");
    const Client client = connect(10);
    client.connection->invalidate();
    device.settle();
    EXPECT_THAT(linesAbout("connection IN"), ElementsAre("connection INTERRUPTED", "connection INVALID"));
    EXPECT_THAT(daemon->departures.copy(),
                ElementsAre(Pair("com.example.app", 10), Pair("com.example.app", 10)));
}

TEST_F(KVConnectionManagerTest, BroadcastPickerIsServedButItsComingAndGoingReachNoOne) {
    addApplication(12, kPicker);
    const Client client = connect(12);
    client.daemon->pauseRecording();
    device.settle();
    client.connection->invalidate();
    device.settle();
    EXPECT_THAT(daemon->requests(), ElementsAre("pauseRecording"));
    EXPECT_THAT(daemon->arrivals.copy(), IsEmpty());
    EXPECT_THAT(daemon->departures.copy(), IsEmpty());
    EXPECT_THAT(linesAbout("connection IN"), IsEmpty());
}

TEST_F(KVConnectionManagerTest, CurrentConnectionFollowsTheLatestRequest) {
    const Client a = connect(20);
    const Client b = connect(21);
    const Client c = connect(22, {{kSetupRight, true}});
    a.daemon->pauseRecording();
    device.settle();
    b.daemon->pauseRecording();
    device.settle();
    EXPECT_EQ(KVMultipleClientProxy::clientProxy()->currentConnectionProcessIdentifier(), 21);
    c.daemon->setupBroadcastWithHostBundleID("", "", {}, {}, nullptr);
    device.settle();
    EXPECT_THAT(daemon->requests(),
                ElementsAre("pauseRecording", "pauseRecording", "setupBroadcastWithHostBundleID"));
    EXPECT_EQ(KVMultipleClientProxy::clientProxy()->currentConnectionProcessIdentifier(), 21)
        << "setting a broadcast up is no change of the recording";
    ASSERT_NE(manager->getCurrentConnection(), nullptr);
    EXPECT_EQ(manager->getCurrentConnection()->processIdentifier(), 21);
}

TEST_F(KVConnectionManagerTest, ReplyMayComeLaterFromAnyThread) {
    daemon->keepsStopHandler = true;
    const Client client = connect(20);
    std::atomic<int> replies{0};
    client.daemon->stopRecordingWithHandler([&](const auto&, const auto&) { ++replies; });
    device.settle();
    EXPECT_EQ(replies, 0);
    GlobalQueue::get(QueuePriority::normal).async([&] {
        daemon->keptStopHandler.exchange(nullptr)(std::nullopt, std::nullopt);
    });
    device.settle();
    EXPECT_EQ(replies, 1);
}

TEST_F(KVConnectionManagerTest, ConnectionsEndFailsARequestWhoseReplyIsOwed) {
    daemon->keepsStopHandler = true;
    const Client client = connect(20);
    client.daemon->stopRecordingWithHandler([](const auto&, const auto&) { FAIL(); });
    device.settle();
    client.connection->invalidate();
    device.settle();
    EXPECT_THAT(client.errors->copy(), ElementsAre(ENOTCONN));
    daemon->keptStopHandler.exchange(nullptr)(std::nullopt, std::nullopt);
    device.settle();
}

TEST_F(KVConnectionManagerTest, SetUpWithNeitherRightIsRefusedWithABareError) {
    const Client client = connect(20, {{kSystemRight, false}});
    std::vector<OptionalError> answers;
    client.daemon->setupBroadcastWithHostBundleID(
        "", "", {}, {}, [&](const OptionalError& error) { answers.push_back(error); });
    device.settle();
    EXPECT_THAT(answers, ElementsAre(KVError("com.quillon.KelvoKit.KVRecordingErrorDomain", -5819)));
    EXPECT_THAT(daemon->requests(), IsEmpty());
    EXPECT_THAT(
        linesAbout("setupBroadcast"),
        ElementsAre("KVConnectionManager: setupBroadcastWithHostBundleID",
                    "KVConnectionManager: setupBroadcastWithHostBundleID failed because client doesn't "
                    "have entitlements to setup broadcast"));
}

TEST_F(KVConnectionManagerTest, SetUpWithoutRightsAndHandlerOnlyLogs) {
    const Client client = connect(20);
    client.daemon->setupBroadcastWithHostBundleID("", "", {}, {}, nullptr);
    device.settle();
    EXPECT_THAT(daemon->requests(), IsEmpty());
    EXPECT_EQ(linesAbout("setupBroadcast").size(), 2U);
}

TEST_F(KVConnectionManagerTest, RightThatIsNoBooleanIsNotEnoughToSetUp) {
    for (const Value& value : {Value(1), Value(0.5), Value("true"), Value(Array{true})}) {
        const Client client = connect(20, {{kSystemRight, value}, {kSetupRight, value}});
        client.daemon->setupBroadcastWithHostBundleID("", "", {}, {}, nullptr);
        device.settle();
    }
    EXPECT_THAT(daemon->requests(), IsEmpty());
}

TEST_F(KVConnectionManagerTest, EitherRightIsEnoughToSetUp) {
    for (const char* right : {kSystemRight, kSetupRight}) {
        const Client client = connect(20, {{right, true}});
        client.daemon->setupBroadcastWithHostBundleID("", "", {}, {}, nullptr);
        device.settle();
    }
    EXPECT_EQ(daemon->requests().size(), 2U);
}

TEST_F(KVConnectionManagerTest, ManagerWithoutADelegateOnlyLogs) {
    const Client client = connect(20);
    daemon.reset();
    client.daemon->pauseRecording();
    device.settle();
    EXPECT_THAT(linesAbout("pauseRecording"), ElementsAre("KVConnectionManager: pauseRecording",
                                                          "KVConnectionManager: pauseRecording completed"));
}

TEST_F(KVConnectionManagerTest, EndpointReachesTheDaemon) {
    const Client client = connect(20);
    const auto anonymous = *device.ipc->createAnonymousListener();
    client.daemon->startRecordingWindowLayerContextIDs({}, {}, false, false, false, false, false,
                                                       anonymous->endpoint(), nullptr);
    device.settle();
    EXPECT_EQ(daemon->endpoint.copy(), anonymous->endpoint());
}

TEST_F(KVConnectionManagerTest, WrongClassAsEndpointEndsThatConnectionAlone) {
    const Client hostile = connect(20);
    const Client other = connect(21);
    const auto surface = *VideoSurface::create(VideoSurface::Geometry::packed(2, 2));
    constexpr std::size_t start = messageIndex<&KVDaemonProtocol::startRecordingWindowLayerContextIDs>();
    std::static_pointer_cast<SimulatedConnection>(hostile.connection)
        ->sendRaw(start, {Array(), Array{1.0, 1.0}, false, false, false, false, false,
                          Array{std::shared_ptr<ObjectHandle>(surface)}});
    device.settle();
    EXPECT_THAT(linesAbout("cut off"),
                ElementsAre("IPC: cut off PID 20: arguments of startRecordingWindowLayerContextIDs are not "
                            "what it takes"));
    EXPECT_THAT(daemon->requests(), IsEmpty());
    hostile.daemon->pauseRecording();
    other.daemon->pauseRecording();
    device.settle();
    EXPECT_THAT(daemon->requests(), ElementsAre("pauseRecording"));
    EXPECT_THAT(hostile.errors->copy(), ElementsAre(ENOTCONN));
    EXPECT_THAT(linesAbout("connection IN"), ElementsAre("connection INVALID"));
    EXPECT_THAT(daemon->departures.copy(), ElementsAre(Pair(std::nullopt, 20)));
}

class RequestTest : public test::ConnectionManagerFixture,
                    public testing::WithParamInterface<DaemonRequest> {};

TEST_P(RequestTest, ArrivesUnchangedAndIsLoggedAroundTheDelegate) {
    std::vector<std::string> order;
    daemon->onRequest.set([&](const std::string&) { order = linesAbout("KVConnectionManager"); });
    const Client client = connect(20, {{kSystemRight, true}});
    std::vector<Array> replies;
    GetParam().make(*client.daemon, [&](Array reply) { replies.push_back(std::move(reply)); });
    device.settle();
    const std::string text = "KVConnectionManager: " + GetParam().name;
    EXPECT_THAT(order, ElementsAre(text));
    EXPECT_THAT(linesAbout("KVConnectionManager"), ElementsAre(text, text + " completed"));
    EXPECT_THAT(daemon->requests(), ElementsAre(GetParam().name));
    EXPECT_THAT(daemon->arguments(), ElementsAre(GetParam().expectedArguments));
    if (GetParam().expectedReply) {
        EXPECT_THAT(replies, ElementsAre(*GetParam().expectedReply));
    } else {
        EXPECT_THAT(replies, IsEmpty());
    }
}

std::string requestName(const testing::TestParamInfo<DaemonRequest>& info) {
    return info.param.name;
}
INSTANTIATE_TEST_SUITE_P(All, RequestTest, testing::ValuesIn(test::daemonRequests()), requestName);

TEST(DaemonInterface, HasTheNineteenRequestsOfItsName) {
    EXPECT_EQ(interfaceOf<KVDaemonProtocol>()->name, "com.quillon.KelvoKit.KVDaemonProtocol");
    EXPECT_EQ(interfaceOf<KVDaemonProtocol>()->methods.size(), 19U);
    EXPECT_EQ(test::daemonRequests().size(), 19U);
    EXPECT_EQ(interfaceOf<KVClientProtocol>()->name, "com.quillon.KelvoKit.KVClientProtocol");
    EXPECT_EQ(interfaceOf<KVClientProtocol>()->methods.size(), 10U);
}

TEST(DaemonInterface, OnlyTheEndpointArgumentCarriesObjects) {
    for (const IPCMethod& method : interfaceOf<KVDaemonProtocol>()->methods) {
        for (std::size_t i = 0; i < method.arguments.size(); ++i) {
            const bool isEndpoint = method.name == "startRecordingWindowLayerContextIDs" && i == 7;
            EXPECT_EQ(method.arguments[i].allowedObjects,
                      isEndpoint ? IPCObjects::endpoints : IPCObjects::none);
        }
    }
}

TEST_F(KVConnectionManagerTest, MoviesAreGivenWhereTheClientFindsThemAndTakenBackSo) {
    daemon->keepsStopHandler = true;
    const Client client = connect(20);
    Guarded<std::vector<std::optional<URL>>> movies;
    client.daemon->stopRecordingWithHandler(
        [&](const auto& movieURL, const auto&) { movies.with([&](auto& all) { all.push_back(movieURL); }); });
    device.settle();
    std::static_pointer_cast<SimulatedConnection>(manager->getCurrentConnection())->peerSuffix = "?peer";
    daemon->keptStopHandler.exchange(nullptr)(URL("file:///m"), std::nullopt);
    client.daemon->saveVideoToCameraRoll(URL("file:///m?peer"), nullptr);
    device.settle();
    EXPECT_THAT(movies.copy(), ElementsAre(URL("file:///m?peer")));
    EXPECT_EQ(daemon->arguments().back(), Array{URL("file:///m")});
}

}  // namespace
}  // namespace kelvo
