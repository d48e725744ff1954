#include "RecordingFixture.h"

namespace kelvo::test {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using StartAnswer = ClientProcess::StartAnswer;
using Wanted = ClientProcess::Wanted;

class InAppRecordingTest : public RecordingFixture {
  protected:
    void SetUp() override { startDaemon(); }

    static Wanted ownWindow(const ClientProcess& client) {
        return {{client.window()}, false, false, false, false};
    }
    /// How often the user was asked.
    int askedTimes() const {
        int times = 0;
        const std::string text = log();
        const std::string line = "KVRecordingManager:showAcknowledgementAlert";
        for (auto at = text.find(line); at != std::string::npos; at = text.find(line, at + 1))
            ++times;
        return times;
    }
};

TEST_F(InAppRecordingTest, CoveredWindowIsRecordedWithConsentAndThenWithoutAsking) {
    const auto client = application();
    {
        const auto accepting = user("other");
        ASSERT_EQ(client->start(ownWindow(*client)), (StartAnswer{0, false, false})) << log();
        XClient other(server_.display());
        const auto cover = other.createWindow({0, 0, kWidth, kHeight}, 0x00FF00);
        other.raise(cover);
        pass(1500ms);
        const auto stopped = client->stop();
        ASSERT_TRUE(stopped && !stopped->movie.empty()) << log();
        EXPECT_GT(countedIn(stopped->movie), 15U);
        EXPECT_FALSE(showsGreen(stopped->movie)) << "a pixel of what covers it";
        EXPECT_THAT(stopped->movie, testing::EndsWith("/First.mp4"));
        EXPECT_EQ(client->save(stopped->movie), 0);
        EXPECT_EQ(library().size(), 1U);
        EXPECT_TRUE(storeGetsEmpty());
    }
    // Exempt by now: nobody is there who could be asked.
    EXPECT_EQ(client->start(ownWindow(*client)), (StartAnswer{0, false, false})) << log();
    pass(300ms);
    EXPECT_NE(client->stop()->movie, "");
    EXPECT_TRUE(client->discard(20s));
    EXPECT_TRUE(storeGetsEmpty());
}

TEST_F(InAppRecordingTest, DecliningUserAndAbsentUserRefuse) {
    const auto client = application();
    EXPECT_EQ(client->start(ownWindow(*client)), (StartAnswer{-5801, false, false})) << "nobody to ask";
    EXPECT_TRUE(logs("error showing acknowledgement alert"));
    const auto declining = user("default");
    EXPECT_EQ(client->start(ownWindow(*client)), (StartAnswer{-5801, false, false}));
    EXPECT_TRUE(logs("user declined"));
    EXPECT_EQ(client->flag("isRecording"), false);
    EXPECT_EQ(askedTimes(), 2);
    EXPECT_THAT(store(), IsEmpty());
}

TEST_F(InAppRecordingTest, ForeignWindowAndApplicationInTheBackAreRefused) {
    const auto first = application("First");
    const auto second = application("Second");
    const auto accepting = user("other");
    EXPECT_EQ(second->start(ownWindow(*first)), (StartAnswer{-5803, false, false})) << "another's window";
    EXPECT_EQ(second->start({{12345}, false, false, false, false}), (StartAnswer{-5803, false, false}));
    EXPECT_EQ(first->start(ownWindow(*first)), (StartAnswer{-5803, false, false})) << "not in front";
    EXPECT_TRUE(logs("app is not in the foreground, calling handler with error"));
    EXPECT_EQ(askedTimes(), 0);
}

TEST_F(InAppRecordingTest, ApplicationThatSharesTheScreenIsRefusedAfterItWasAllowed) {
    const auto left = application("Left", {0, 20, kWidth / 2 - 4, kHeight - 30});
    const auto right = application("Right", {kWidth / 2, 20, kWidth / 2 - 4, kHeight - 30});
    placeBeside(*left, {0, 20, kWidth / 2 - 4, kHeight - 30});
    placeBeside(*right, {kWidth / 2, 20, kWidth / 2 - 4, kHeight - 30});
    const auto accepting = user("other");
    EXPECT_EQ(right->start(ownWindow(*right)), (StartAnswer{-5807, false, false})) << log();
    EXPECT_TRUE(logs("attempted to start recording in split mode, bailing out"));
    EXPECT_EQ(askedTimes(), 1);
}

TEST_F(InAppRecordingTest, CaptureBringsEveryPictureAndNoMovie) {
    const auto client = application();
    const auto accepting = user("other");
    Wanted wanted = ownWindow(*client);
    wanted.capture = true;
    ASSERT_EQ(client->start(wanted), (StartAnswer{0, false, false})) << log();
    ASSERT_TRUE(eventually([&] { return !client->told().videoSamples.copy().empty(); }, 20s)) << log();
    std::set<std::uint32_t> seen;
    // A picture that is held is not used again: eight are all there are.
    EXPECT_TRUE(eventually(
        [&] {
            for (const auto& sample : client->told().videoSamples.exchange({})) {
                const auto number = NumberedPicture::read(*sample.surface->ioSurface());
                if (number) seen.insert(*number);
            }
            return seen.size() > 20;
        },
        20s))
        << seen.size();
    const auto stopped = client->stop();
    ASSERT_TRUE(stopped);
    EXPECT_EQ(stopped->movie, "");
    EXPECT_EQ(stopped->code, 0);
    EXPECT_TRUE(storeGetsEmpty());
}

TEST_F(InAppRecordingTest, PauseIsCutOutAndTrimmedEndsAreGone) {
    const auto client = application();
    const auto accepting = user("other");
    ASSERT_EQ(client->start(ownWindow(*client))->code, 0) << log();
    pass(1600ms);
    client->daemon().pauseRecording();
    EXPECT_TRUE(logs("KVRecordingSession: pauseSession"));
    pass(1500ms);
    client->daemon().resumeRecordingWithWindowLayerContextID(client->window());
    EXPECT_TRUE(logs("KVRecordingSession: resumeSessionWithContextID:"));
    pass(1600ms);
    const auto stopped = client->stop(1, 1);
    ASSERT_TRUE(stopped && !stopped->movie.empty()) << log();
    EXPECT_THAT(stopped->movie, testing::EndsWith("/First_trimmed.mp4"));
    const auto frames = readCounterMovie(stopped->movie);
    EXPECT_GT(countedIn(stopped->movie), 5U);
    bool hasJumped = false;  // over the pause, in the numbers and not in time
    for (std::size_t i = 1; i < frames.size(); ++i) {
        const bool isBoth = frames[i].number && frames[i - 1].number;
        if (isBoth && *frames[i].number > *frames[i - 1].number + 45)
            hasJumped = frames[i].seconds - frames[i - 1].seconds < 0.7;
    }
    EXPECT_TRUE(hasJumped);
    // Whoever is late is so on both sides: 3.2 seconds less two.
    EXPECT_LT(secondsOf(stopped->movie), 2.6);
    EXPECT_TRUE(client->discard(20s));
}

TEST_F(InAppRecordingTest, PausedRecordingEndsWithAForeignWindow) {
    const auto client = application();
    const auto accepting = user("other");
    ASSERT_EQ(client->start(ownWindow(*client))->code, 0) << log();
    pass(600ms);
    client->daemon().pauseRecording();
    client->daemon().resumeRecordingWithWindowLayerContextID(12345);
    ASSERT_TRUE(eventually([&] { return stopCodes(*client).size() == 1; }, 20s)) << log();
    EXPECT_THAT(stopCodes(*client), ElementsAre(-5816));
    const auto movie = client->told().stops.copy().front().movieURL;
    ASSERT_TRUE(movie);
    EXPECT_GT(countedIn(movie->path()), 5U);
    EXPECT_TRUE(client->discard(20s));
    EXPECT_TRUE(storeGetsEmpty());
}

TEST_F(InAppRecordingTest, DiscardIsSilentWhileRecordingAndThenEmptiesTheStore) {
    const auto client = application();
    const auto accepting = user("other");
    ASSERT_EQ(client->start(ownWindow(*client))->code, 0) << log();
    pass(400ms);
    EXPECT_FALSE(client->discard(300ms));
    EXPECT_TRUE(logs("can't discard recording while recording is in progress"));
    const auto stopped = client->stop();
    ASSERT_TRUE(stopped && std::filesystem::exists(stopped->movie)) << log();
    EXPECT_TRUE(client->discard(20s));
    EXPECT_TRUE(storeGetsEmpty());
}

TEST_F(InAppRecordingTest, SecondApplicationThrowsTheFirstOnesRecordingAway) {
    const auto first = application("First");
    const auto accepting = user("other");
    ASSERT_EQ(first->start(ownWindow(*first))->code, 0) << log();
    pass(400ms);
    const auto second = application("Second");
    ASSERT_EQ(second->start(ownWindow(*second))->code, 0) << log();
    ASSERT_TRUE(eventually([&] { return stopCodes(*first).size() == 1; }, 20s)) << log();
    EXPECT_THAT(stopCodes(*first), ElementsAre(-5806));
    EXPECT_FALSE(first->told().stops.copy().front().movieURL);
    pass(600ms);
    const auto stopped = second->stop();
    ASSERT_TRUE(stopped);
    EXPECT_GT(countedIn(stopped->movie), 5U);
    EXPECT_TRUE(second->discard(20s));
    EXPECT_TRUE(storeGetsEmpty());
    EXPECT_THAT(library(), IsEmpty());
}

TEST_F(InAppRecordingTest, ApplicationThatDiesTakesItsRecordingWithIt) {
    const auto client = application();
    const auto accepting = user("other");
    ASSERT_EQ(client->start(ownWindow(*client))->code, 0) << log();
    ASSERT_TRUE(eventually([&] { return store().size() == 1; }, 20s));
    pass(300ms);
    client->kill();
    EXPECT_TRUE(logs("recording stopped without handler!"));
    EXPECT_TRUE(storeGetsEmpty());
    const auto again = application();
    EXPECT_EQ(again->flag("isRecording"), false);
}

TEST_F(InAppRecordingTest, UnansweredAlertHoldsUpNeitherTheEndNorStatus) {
    const auto client = application();
    KelvoctlProcess reading(socket(), {"shell"});
    ASSERT_TRUE(reading.waitForLine("showing alerts")) << reading.output();
    const auto answer = std::make_shared<Answered<std::int64_t>>();
    client->daemon().startRecordingWindowLayerContextIDs(
        {client->window()}, {100, 100}, false, false, false, false, false, nullptr,
        [answer](const OptionalError& error, bool, bool) { answer->set(error ? error->code() : 0); });
    EXPECT_TRUE(logs("KVRecordingManager:showAcknowledgementAlert"));
    daemon_->signal(SIGTERM);
    EXPECT_EQ(daemon_->waitForExit(), 0) << log();
    EXPECT_TRUE(logs("user declined"));
}

}  // namespace
}  // namespace kelvo::test
