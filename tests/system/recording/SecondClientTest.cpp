#include "RecordingFixture.h"

namespace kelvo::test {
namespace {

/// A client that starts while another one records.
class SecondClientTest : public RecordingFixture {
  protected:
    void SetUp() override { startDaemon(); }
};

TEST_F(SecondClientTest, SecondApplicationThrowsTheFirstOnesRecordingAway) {
    const auto first = application("First");
    const auto accepting = user("other");
    ASSERT_EQ(first->start(ownWindow(*first))->code, 0) << log();
    ASSERT_TRUE(eventually([&] { return store().size() == 1; }, 20s));
    const auto second = application("Second");
    ASSERT_EQ(second->start(ownWindow(*second))->code, 0) << log();
    ASSERT_TRUE(eventually([&] { return stopCodes(*first).size() == 1; }, 20s)) << log();
    EXPECT_THAT(stopCodes(*first), ElementsAre(-5806));
    EXPECT_FALSE(first->told().stops.copy().front().movieURL);
    pass(600ms);
    const auto stopped = second->stop();
    ASSERT_TRUE(stopped);
    EXPECT_GT(countedIn(stopped->movie), 5U);
    EXPECT_THAT(store(), ElementsAre(testing::EndsWith("/Second.mp4"))) << "nothing is left of the first";
    EXPECT_THAT(second->told().stops.copy(), IsEmpty());
    EXPECT_TRUE(second->discard(20s));
    expectNothingKept();
}

TEST_F(SecondClientTest, ApplicationThatStartsSavesTheRecordingOfTheScreen) {
    const auto client = shell();
    const auto first = application();
    const auto accepting = user("other");
    ASSERT_EQ(client->start(wholeScreen())->code, 0) << log();
    pass(1200ms);
    ASSERT_EQ(first->start(ownWindow(*first)), (StartAnswer{0, false, false})) << log();
    ASSERT_EQ(library().size(), 1U) << "saved before the other begins";
    EXPECT_TRUE(
        logs("KVRecordingManager:stopCurrentRecordingSession: Video saved to camera roll successful"));
    EXPECT_GT(countedIn(library().front()), 10U);
    EXPECT_EQ(probeStream(library().front(), "v:0", "width,height"), "320,480");
    EXPECT_THAT(stopCodes(*client), IsEmpty()) << "who records the screen is not told";
    EXPECT_EQ(first->flag("isSystemRecording"), false);
    pass(600ms);
    const auto stopped = first->stop();
    ASSERT_TRUE(stopped);
    EXPECT_THAT(stopped->movie, testing::EndsWith("/First.mp4"));
    EXPECT_GT(countedIn(stopped->movie), 5U);
    EXPECT_TRUE(first->discard(20s));
    EXPECT_TRUE(eventually([&] { return store().size() == 1; }, 20s)) << "the saved one's file";
    EXPECT_EQ(library().size(), 1U);
}

TEST_F(SecondClientTest, RecordingOfTheScreenThrowsAnApplicationsAway) {
    const auto client = shell();
    const auto first = application();
    const auto accepting = user("other");
    ASSERT_EQ(first->start(ownWindow(*first))->code, 0) << log();
    ASSERT_TRUE(eventually([&] { return store().size() == 1; }, 20s));
    ASSERT_EQ(client->start(wholeScreen()), (StartAnswer{0, false, false})) << log();
    ASSERT_TRUE(eventually([&] { return stopCodes(*first).size() == 1; }, 20s)) << log();
    EXPECT_THAT(stopCodes(*first), ElementsAre(-5806));
    EXPECT_FALSE(first->told().stops.copy().front().movieURL);
    EXPECT_EQ(client->flag("isSystemRecording"), true);
    pass(1000ms);
    const auto stopped = client->stop();
    ASSERT_TRUE(stopped && !stopped->movie.empty()) << log();
    EXPECT_GT(countedIn(stopped->movie), 5U);
    EXPECT_THAT(store(), ElementsAre(testing::HasSubstr("/ScreenRecording_"))) << "nothing else is left";
    EXPECT_EQ(client->save(stopped->movie), 0);
    EXPECT_EQ(library().size(), 1U);
    EXPECT_TRUE(storeGetsEmpty());
}

}  // namespace
}  // namespace kelvo::test
