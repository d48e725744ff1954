#include "ClientServiceContract.h"
#include "ipc/KVBroadcastConfigurationCoding.h"

namespace kelvo::test {
namespace {

using testing::ElementsAre;
using testing::Pair;

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

}  // namespace
}  // namespace kelvo::test
