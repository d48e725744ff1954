#include "RecordingFixture.h"

namespace kelvo::test {
namespace {

class InAppRecordingTest : public RecordingFixture {
  protected:
    void SetUp() override { startDaemon(); }

    /// Whether, somewhere, the counter is more than `numbers` further and the movie's time hardly so.
    static bool skips(const std::string& movie, std::uint32_t numbers) {
        std::optional<CounterFrame> last;
        for (const CounterFrame& frame : readCounterMovie(movie)) {
            if (!frame.number) continue;
            if (last && *frame.number > *last->number + numbers && frame.seconds - last->seconds < 0.7)
                return true;
            last = frame;
        }
        return false;
    }
    /// What a user does with the window through the window manager.
    void handleWindow(const ClientProcess& client, const std::string& command) const {
        outputOf("DISPLAY=" + server_.display() + " xdotool " + command + " " +
                 std::to_string(client.window()) + " 2>&1");
    }
    static bool hears(const ClientProcess& client, const std::string& message) {
        return eventually(
            [&] {
                const auto messages = client.told().messages();
                return std::ranges::find(messages, message) != messages.end();
            },
            20s);
    }
};

TEST_F(InAppRecordingTest, CoveredWindowIsRecordedWithConsentAndThenWithoutAsking) {
    const auto client = application();
    {
        const auto accepting = user("other");
        ASSERT_EQ(client->start(ownWindow(*client)), (StartAnswer{0, false, false})) << log();
        EXPECT_EQ(client->flag("isRecording"), true);
        EXPECT_EQ(client->flag("isSystemRecording"), false);
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
        ASSERT_EQ(library().size(), 1U);
        EXPECT_GT(countedIn(library().front()), 15U);
        EXPECT_FALSE(showsGreen(library().front()));
        EXPECT_TRUE(storeGetsEmpty());
    }
    // Exempt by now: nobody is there who could be asked.
    EXPECT_EQ(client->start(ownWindow(*client)), (StartAnswer{0, false, false})) << log();
    pass(900ms);
    const auto stopped = client->stop();
    ASSERT_TRUE(stopped && !stopped->movie.empty()) << log();
    EXPECT_GT(countedIn(stopped->movie), 5U);
    EXPECT_EQ(client->save(stopped->movie), 0);
    ASSERT_EQ(library().size(), 2U);
    for (const std::string& movie : library())
        EXPECT_GT(countedIn(movie), 5U);
    EXPECT_EQ(client->flag("isRecording"), false);
    EXPECT_THAT(client->told().stops.copy(), IsEmpty());
    EXPECT_TRUE(storeGetsEmpty());
    EXPECT_EQ(timesLogged("user acknowledged recording"), 1U) << "one alert for both";
    EXPECT_EQ(timesLogged("error showing acknowledgement alert"), 0U);
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
    EXPECT_EQ(client->flag("isRecording"), false);
    EXPECT_THAT(client->told().stops.copy(), IsEmpty());
    expectNothingKept();
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
    EXPECT_GT(countedIn(stopped->movie), 5U);
    EXPECT_TRUE(skips(stopped->movie, 45)) << "the pause";
    // Whoever is late is so on both sides: 3.2 seconds less two.
    EXPECT_LT(secondsOf(stopped->movie), 2.6);
    EXPECT_EQ(client->save(stopped->movie), 0);
    ASSERT_EQ(library().size(), 1U);
    EXPECT_GT(countedIn(library().front()), 5U);
    EXPECT_LT(secondsOf(library().front()), 2.6);
    EXPECT_TRUE(client->discard(20s)) << "the movie from which it was cut";
    EXPECT_TRUE(storeGetsEmpty());
}

TEST_F(InAppRecordingTest, ApplicationThatLeavesTheScreenPausesUntilItGoesOn) {
    const auto client = application();
    const auto accepting = user("other");
    ASSERT_EQ(client->start(ownWindow(*client))->code, 0) << log();
    pass(1200ms);
    handleWindow(*client, "windowminimize");
    EXPECT_TRUE(hears(*client, "recordingDidPause")) << log();
    EXPECT_EQ(client->flag("isRecording"), true);
    pass(1500ms);
    handleWindow(*client, "windowactivate");
    EXPECT_TRUE(hears(*client, "recordingShouldResume")) << log();
    EXPECT_EQ(timesLogged("KVRecordingSession: resumeSessionWithContextID:"), 0U) << "that is the client's";
    ASSERT_TRUE(eventually([&] { return isInFront(*client); }, 20s));
    client->daemon().resumeRecordingWithWindowLayerContextID(client->window());
    EXPECT_TRUE(logs("KVRecordingSession: resumeSessionWithContextID:"));
    pass(1200ms);
    const auto stopped = client->stop();
    ASSERT_TRUE(stopped && !stopped->movie.empty()) << log();
    EXPECT_GT(countedIn(stopped->movie), 12U);
    EXPECT_TRUE(skips(stopped->movie, 45)) << "the time that nobody saw it";
    EXPECT_THAT(client->told().messages(), ElementsAre("recordingDidPause", "recordingShouldResume"));
    EXPECT_TRUE(client->discard(20s));
    expectNothingKept();
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
    EXPECT_EQ(client->flag("isRecording"), false);
    expectNothingKept();
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
    expectNothingKept();
}

TEST_F(InAppRecordingTest, ApplicationThatStartsAgainGetsTheNewMovieWhole) {
    const auto client = application();
    const auto accepting = user("other");
    ASSERT_EQ(client->start(ownWindow(*client))->code, 0) << log();
    for (std::size_t again = 1; again <= 5; ++again) {
        ASSERT_TRUE(eventually([&] { return store().size() == 1; }, 20s)) << log();
        ASSERT_EQ(client->start(ownWindow(*client)), (StartAnswer{0, false, false})) << log();
        EXPECT_EQ(stopCodes(*client).size(), again) << "told before the new one is";
        EXPECT_EQ(client->flag("isRecording"), true);
    }
    EXPECT_THAT(stopCodes(*client), testing::Each(-5806));
    pass(1000ms);
    const auto stopped = client->stop();
    ASSERT_TRUE(stopped && !stopped->movie.empty()) << log();
    EXPECT_GT(countedIn(stopped->movie), 10U);
    EXPECT_EQ(timesLogged("user acknowledged recording"), 1U) << "exempt after that";
    EXPECT_TRUE(client->discard(20s));
    expectNothingKept();
}

TEST_F(InAppRecordingTest, ApplicationThatDiesTakesItsRecordingWithIt) {
    const auto client = application();
    const auto accepting = user("other");
    ASSERT_EQ(client->start(ownWindow(*client))->code, 0) << log();
    ASSERT_TRUE(eventually([&] { return store().size() == 1; }, 20s));
    pass(300ms);
    client->kill();
    EXPECT_TRUE(logs("recording stopped without handler!"));
    expectNothingKept();
    const auto again = application();
    EXPECT_EQ(again->flag("isRecording"), false);
}

TEST_F(InAppRecordingTest, UnansweredAlertHoldsUpItsQueueButNotTheEnd) {
    const auto client = application();
    const auto other = shell();
    KelvoctlProcess reading(socket(), {"shell"});
    ASSERT_TRUE(reading.waitForLine("showing alerts")) << reading.output();
    const auto started = std::make_shared<Answered<StartAnswer>>();
    client->requestStart(ownWindow(*client), {kWidth, kHeight}, started);
    EXPECT_TRUE(logs("KVRecordingManager:showAcknowledgementAlert"));
    const auto state = std::make_shared<Answered<bool>>();
    other->daemon().synchronousGetCurrentState([state](const auto& found) {
        const Value* const value = found ? found->find("isRecording") : nullptr;
        state->set(value != nullptr && value->asBool().value_or(true));
    });
    pass(500ms);
    EXPECT_FALSE(state->isSet()) << "one request after the other";
    daemon_->signal(SIGTERM);
    EXPECT_EQ(daemon_->waitForExit(), 0) << log();
    EXPECT_EQ(started->wait(), (StartAnswer{-5801, false, false}));
    EXPECT_NE(state->wait(1s), true);
    EXPECT_TRUE(logs("user declined"));
    expectNothingKept();
}

}  // namespace
}  // namespace kelvo::test
