#include "RecorderFixture.h"
#include "kit/LocalDaemon.h"
#include "support/TemporaryDirectory.h"

namespace kelvokit {
namespace {

using testing::ElementsAre;

class RecorderConnectionTest : public RecorderFixture {};

TEST_F(RecorderConnectionTest, AbsentDaemonIsAClearError) {
    isDaemonUp = false;
    std::optional<Error> error;
    recorder->save("/m.mp4", [&](const std::optional<Error>& given) { error = given; });
    settle();
    ASSERT_TRUE(error);
    EXPECT_TRUE(error->is(ErrorCode::connectionInvalid));
    EXPECT_THAT(error->detail, testing::HasSubstr("/run/socket"));
    EXPECT_THAT(losses, ElementsAre());
    EXPECT_FALSE(recorder->state().isConnected);
}

TEST_F(RecorderConnectionTest, EveryRequestFailsWhenTheDaemonIsAbsent) {
    isDaemonUp = false;
    recorder->start({}, noteStart());
    recorder->stop(noteMovie());
    recorder->discard(noteDone());
    recorder->setUpBroadcast({}, noteDone());
    recorder->getBroadcastImages([this](const auto&, const auto&, const auto& error) { noteDone()(error); });
    recorder->getBroadcastExtensions([this](const auto&, const auto& error) { noteDone()(error); });
    recorder->isBroadcasting("x", [this](bool, const auto& error) { noteDone()(error); });
    recorder->pause();
    settle();
    EXPECT_THAT(answers, testing::AllOf(testing::SizeIs(7), testing::Each("-5814")));
}

TEST_F(RecorderConnectionTest, RequestUnderWayFailsWhenTheDaemonIsLost) {
    daemon->keepsStopHandler = true;
    startRecording();
    const auto connection = daemon->client.copy();
    // The fake daemon never answers this one.
    daemon->onRequest.set([&](const std::string& request) {
        if (request == "saveVideoToCameraRoll") connection->invalidate();
    });
    recorder->save("/m.mp4", noteDone());
    settle();
    EXPECT_THAT(answers, ElementsAre("-5815"));
}

TEST_F(RecorderConnectionTest, LostDaemonIsReportedAndItsRecordingIsGone) {
    startRecording();
    killDaemon();
    EXPECT_THAT(losses, ElementsAre(-5815));
    EXPECT_EQ(recorder->state(), RecorderState());
}

TEST_F(RecorderConnectionTest, DaemonIsLookedForWithGrowingPausesUntilItIsBack) {
    startRecording();
    killDaemon();
    std::vector<std::int64_t> pauses;
    for (int i = 0; i < 8; ++i)
        pauses.push_back(fireTimer().count());
    EXPECT_THAT(pauses, ElementsAre(100, 200, 400, 800, 1600, 3200, 5000, 5000));
    EXPECT_EQ(restorations, 0);
    startDaemon();
    fireTimer();
    EXPECT_EQ(restorations, 1);
    EXPECT_TRUE(recorder->state().isConnected);
    EXPECT_EQ(daemon->requests().back(), "synchronousGetCurrentState");
    EXPECT_TRUE(timers.copy().empty());
    killDaemon();
    EXPECT_EQ(fireTimer().count(), 100);
}

TEST_F(RecorderConnectionTest, RequestLooksForALostDaemonAtOnce) {
    startRecording();
    killDaemon();
    startDaemon();
    recorder->discard(noteDone());
    settle();
    EXPECT_THAT(answers, ElementsAre("done"));
}

TEST_F(RecorderConnectionTest, NoHandlerRunsOnceTheRecorderIsGone) {
    startRecording();
    recorder->discard(noteDone());
    device.settle();
    recorder.reset();
    settle();
    EXPECT_THAT(answers, ElementsAre());
}

TEST_F(RecorderConnectionTest, RecorderMayGoInsideAHandler) {
    recorder->stop([this](const auto&, const auto&) {
        recorder.reset();
        answers.emplace_back("gone");
    });
    settle();
    EXPECT_THAT(answers, ElementsAre("gone"));
}

TEST_F(RecorderConnectionTest, GoneRecorderLooksForNoDaemon) {
    startRecording();
    killDaemon();
    recorder.reset();
    const int before = attempts;
    fireTimer();
    EXPECT_EQ(attempts, before);
}

TEST_F(RecorderConnectionTest, RecorderThatGoesWhileItIsLookedForLeavesNoConnection) {
    startRecording();
    killDaemon();
    startDaemon();
    const std::size_t before = daemon->departures.copy().size();
    afterConnecting = [this] { recorder.reset(); };
    fireTimer();
    EXPECT_EQ(daemon->departures.copy().size(), before + 2);
}

TEST_F(RecorderConnectionTest, HandlerThatRunsAtOnceMayMakeRequests) {
    const auto direct =
        RecorderTestAccess::make({[this] { return connect(); }, [](auto, auto) {}, [](auto task) { task(); },
                                  std::make_shared<kelvo::KVUserErrors>(localization)});
    direct->onState([&](const RecorderState& state) {
        if (state.isConnected) direct->pause();
    });
    direct->discard();
    settle();
    EXPECT_THAT(daemon->requests(), ElementsAre("pauseRecording", "discardRecordingWithHandler"));
}

TEST(SocketPathTest, OptionWinsOverTheEnvironmentAndThatOverTheUsualPlace) {
    ::unsetenv("KELVO_SOCKET");
    ::unsetenv("XDG_RUNTIME_DIR");
    EXPECT_EQ(socketPath({}), "/run/kelvod/com.quillon.kelvod");
    ::setenv("KELVO_SOCKET", "/tmp/named", 1);
    EXPECT_EQ(socketPath({}), "/tmp/named");
    EXPECT_EQ(socketPath({.socketPath = "/tmp/given", .executor = {}}), "/tmp/given");
    ::unsetenv("KELVO_SOCKET");
}

TEST(SocketPathTest, UsersOwnDaemonComesBeforeTheDevicesOnceItsSocketIsThere) {
    const kelvo::test::TemporaryDirectory folder;
    ::unsetenv("KELVO_SOCKET");
    ::setenv("XDG_RUNTIME_DIR", folder.path().c_str(), 1);
    EXPECT_EQ(socketPath({}), "/run/kelvod/com.quillon.kelvod");
    folder.write("kelvod/com.quillon.kelvod", "");
    EXPECT_EQ(socketPath({}), folder.path() + "/kelvod/com.quillon.kelvod");
    ::setenv("KELVO_SOCKET", "/tmp/named", 1);
    EXPECT_EQ(socketPath({}), "/tmp/named");
    ::unsetenv("KELVO_SOCKET");
    ::unsetenv("XDG_RUNTIME_DIR");
}

TEST(LocalRecorderTest, AbsentDaemonIsToldWithATextForTheUser) {
    Recorder recorder({.socketPath = "/nonexistent/socket", .executor = [](auto task) { task(); }});
    std::optional<Error> error;
    recorder.discard([&](const std::optional<Error>& given) { error = given; });
    ASSERT_TRUE(error);
    EXPECT_TRUE(error->is(ErrorCode::connectionInvalid));
    EXPECT_EQ(error->description, "There is no valid connection to the recording service.");
    EXPECT_THAT(error->detail, testing::HasSubstr("/nonexistent/socket"));
}

}  // namespace
}  // namespace kelvokit
