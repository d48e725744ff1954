#include "RecorderFixture.h"
#include "ipc/KVBroadcastConfigurationCoding.h"

#include <cmath>

namespace kelvokit {
namespace {

using testing::ElementsAre;

class RecorderTest : public RecorderFixture {};

TEST_F(RecorderTest, StartSendsWhatIsToBeRecorded) {
    recorder->start({{7, 9}, 100, 200.5, true, true}, noteStart());
    settle();
    EXPECT_THAT(daemon->requests(), ElementsAre("startRecordingWindowLayerContextIDs"));
    EXPECT_EQ(daemon->arguments().front(),
              (kelvo::Array{kelvo::Array{7, 9}, 100.0, 200.5, true, true, false, false, false, false}));
    EXPECT_THAT(answers, ElementsAre("started+mic"));
}

TEST_F(RecorderTest, CaptureAndBroadcastAreStartsOfTheirOwnKind) {
    recorder->startCapture({});
    recorder->startBroadcast({});
    settle();
    const auto arguments = daemon->arguments();
    EXPECT_EQ(arguments[0][5], false);
    EXPECT_EQ(arguments[0][7], true);
    EXPECT_EQ(arguments[1][5], true);
    EXPECT_EQ(arguments[1][7], false);
    EXPECT_TRUE(recorder->state().isBroadcasting);
}

TEST_F(RecorderTest, RefusedStartGivesTheDaemonsErrorAndChangesNothing) {
    daemon->isWilling = false;
    recorder->start({}, noteStart());
    settle();
    EXPECT_THAT(answers, ElementsAre("-5"));
    EXPECT_FALSE(recorder->state().isRecording);
}

TEST_F(RecorderTest, StateFollowsWhatIsDone) {
    startRecording();
    recorder->pause();
    settle();
    recorder->resume(7);
    recorder->setMicrophoneEnabled(false);
    recorder->stop();
    settle();
    EXPECT_THAT(
        states,
        ElementsAre(
            RecorderState{.isConnected = true},
            RecorderState{.isConnected = true, .isRecording = true, .isMicrophoneEnabled = true},
            RecorderState{
                .isConnected = true, .isRecording = true, .isPaused = true, .isMicrophoneEnabled = true},
            RecorderState{.isConnected = true, .isRecording = true, .isMicrophoneEnabled = true},
            RecorderState{.isConnected = true, .isRecording = true}, RecorderState{.isConnected = true}));
    EXPECT_THAT(daemon->requests(),
                ElementsAre("startRecordingWindowLayerContextIDs", "pauseRecording",
                            "resumeRecordingWithWindowLayerContextID", "setMicrophoneEnabled",
                            "stopRecordingWithStartClipDuration"));
}

TEST_F(RecorderTest, PauseAndMicrophoneWithoutARecordingChangeNoState) {
    recorder->pause();
    recorder->setMicrophoneEnabled(true);
    settle();
    EXPECT_EQ(recorder->state(), RecorderState{.isConnected = true});
}

TEST_F(RecorderTest, StopWithTrimSendsBothDurations) {
    recorder->stop(1.5, 2.5, noteMovie());
    settle();
    EXPECT_EQ(daemon->arguments().front(), (kelvo::Array{1.5, 2.5}));
    EXPECT_THAT(answers, ElementsAre("-5"));
}

TEST_F(RecorderTest, SaveSendsThePathAsAURLAndGivesTheError) {
    recorder->save("/movies/a b.mp4", noteDone());
    settle();
    EXPECT_EQ(daemon->arguments().front(), kelvo::Array{kelvo::URL::file("/movies/a b.mp4")});
    EXPECT_THAT(answers, ElementsAre("-5"));
}

TEST_F(RecorderTest, DiscardIsAnswered) {
    recorder->discard(noteDone());
    settle();
    EXPECT_THAT(answers, ElementsAre("done"));
}

TEST_F(RecorderTest, DiscardWhileRecordingFailsWithoutAskingADaemonThatWouldBeSilent) {
    startRecording();
    recorder->discard(noteDone());
    settle();
    EXPECT_THAT(answers, ElementsAre("-5804"));
    EXPECT_THAT(daemon->requests(), ElementsAre("startRecordingWindowLayerContextIDs"));
}

TEST_F(RecorderTest, BroadcastIsSetUpWithItsArchivedConfiguration) {
    device.ipc->setIdentity(5, {{"com.quillon.private.kelvo-kit.can-setup-broadcast", true}});
    recorder->setUpBroadcast(
        {"host", "extension", 2.5, {{"rate", std::int64_t{3}}}, {{"key", std::string("text")}}}, noteDone());
    settle();
    EXPECT_THAT(answers, ElementsAre("done"));
    const kelvo::Array sent = daemon->arguments().front();
    EXPECT_EQ(sent[0], "host");
    EXPECT_EQ(sent[1], "extension");
    EXPECT_EQ(sent[3], (kelvo::Dictionary{{"key", "text"}}));
    const auto archived =
        kelvo::unarchived<kelvo::KVBroadcastConfigurationCoding>(*sent[2].as<kelvo::Bytes>());
    ASSERT_TRUE(archived);
    EXPECT_EQ(archived->clipDuration(), 2.5);
    EXPECT_EQ(archived->videoCompressionProperties(), (kelvo::Dictionary{{"rate", 3}}));
}

TEST_F(RecorderTest, BroadcastSetUpWithoutTheRightIsRefused) {
    recorder->setUpBroadcast({}, [this](const std::optional<Error>& error) {
        ASSERT_TRUE(error);
        EXPECT_TRUE(error->is(ErrorCode::broadcastSetupRefused));
        answers.emplace_back("refused");
    });
    settle();
    EXPECT_THAT(answers, ElementsAre("refused"));
}

TEST_F(RecorderTest, BroadcastQueriesGiveWhatTheDaemonKnows) {
    std::vector<std::byte> host;
    std::vector<Dictionary> extensions;
    bool isOn = false;
    recorder->getBroadcastImages([&](const auto& image, const auto&, const auto&) { host = image; });
    recorder->getBroadcastExtensions([&](const auto& found, const auto&) { extensions = found; });
    recorder->isBroadcasting("preferred", [&](bool value, const auto&) { isOn = value; });
    recorder->setBroadcastURL("https://example.com/live");
    settle();
    EXPECT_EQ(host, (std::vector{std::byte{1}, std::byte{2}}));
    EXPECT_THAT(extensions, ElementsAre(Dictionary{{"displayName", std::string("One")}},
                                        Dictionary{{"displayName", std::string("Two")}}));
    EXPECT_TRUE(isOn);
    EXPECT_EQ(daemon->arguments().back(), kelvo::Array{kelvo::URL("https://example.com/live")});
}

TEST_F(RecorderTest, CallbacksReachTheirHandlers) {
    startRecording();
    std::vector<std::string> heard;
    recorder->onLock([&](const Error& error) { heard.push_back("lock " + error.description); });
    recorder->onShouldResume([&] { heard.emplace_back("resume"); });
    recorder->onTimer([&](const std::string& text) { heard.push_back(text); });
    recorder->onBroadcastURL([&](const std::string& url) { heard.push_back(url); });
    recorder->onBroadcastInfo(
        [&](const Dictionary& info) { heard.push_back(std::get<std::string>(info.at("a"))); });
    asDaemon([](auto& client) {
        client.recordingLockInterrupted(
            {"d", -5809, {{std::string(kelvo::kLocalizedDescriptionKey), "locked"}}});
        client.recordingDidPause();
        client.recordingShouldResume();
        client.recordingTimerDidUpdate("0:07");
        client.updateBroadcastURL(kelvo::URL("https://x"));
        client.updateBroadcastServiceInfo({{"a", "b"}, {"left out", kelvo::Array{1}}});
    });
    EXPECT_THAT(heard, ElementsAre("lock locked", "resume", "0:07", "https://x", "b"));
    EXPECT_TRUE(recorder->state().isPaused);
}

TEST_F(RecorderTest, RecordingThatEndsByItselfIsReportedWithItsMovie) {
    startRecording();
    asDaemon([](auto& client) {
        client.recordingDidStopWithError(kelvo::KVError("d", -5806, {}), kelvo::URL("file:///m.mp4"));
    });
    EXPECT_THAT(stops, ElementsAre(std::pair("/m.mp4", -5806)));
    EXPECT_FALSE(recorder->state().isRecording);
}

TEST_F(RecorderTest, ChangedDaemonIsAskedForItsState) {
    startRecording();
    recorder->stop();
    settle();
    EXPECT_FALSE(recorder->state().isRecording);
    asDaemon([](auto& client) { client.updateScreenRecordingState(); });
    EXPECT_TRUE(recorder->state().isRecording);
}

TEST_F(RecorderTest, RequestsWithoutAHandlerAreAllowed) {
    recorder->start({});
    recorder->stop();
    recorder->discard();
    recorder->save("/m.mp4");
    recorder->setUpBroadcast({});
    recorder->getBroadcastImages({});
    recorder->getBroadcastExtensions({});
    recorder->isBroadcasting("x", {});
    settle();
    isDaemonUp = false;
    killDaemon();
    recorder->start({});
    recorder->stop();
    settle();
    EXPECT_FALSE(recorder->state().isConnected);
}

}  // namespace
}  // namespace kelvokit
