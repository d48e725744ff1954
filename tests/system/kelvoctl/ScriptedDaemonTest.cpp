#include "ScriptedDaemon.h"

#include <csignal>
#include <filesystem>

namespace kelvo {
namespace {

using test::errorSaying;
using test::KelvoctlProcess;
using test::KelvoctlRecordingTest;
using testing::ElementsAre;
using Answer = std::pair<int, std::string>;

TEST_F(KelvoctlRecordingTest, CtrlCStopsAndSaves) {
    KelvoctlProcess record(socket, {"record"});
    ASSERT_TRUE(record.waitForLine("recording; Ctrl-C")) << record.output();
    record.signal(SIGINT);
    EXPECT_EQ(record.waitForExit(), 0);
    EXPECT_NE(record.output().find(" s to the library\n"), std::string::npos) << record.output();
    ASSERT_THAT(daemon->requests(), ElementsAre("startRecordingWindowLayerContextIDs",
                                                "stopRecordingWithHandler", "saveVideoToCameraRoll"));
    EXPECT_EQ(daemon->arguments()[2], Array{*daemon->movie.copy()});
}

TEST_F(KelvoctlRecordingTest, TerminalThatIsClosedStopsAndSaves) {
    KelvoctlProcess record(socket, {"record"});
    ASSERT_TRUE(record.waitForLine("recording; Ctrl-C")) << record.output();
    record.signal(SIGHUP);
    EXPECT_EQ(record.waitForExit(), 0);
    EXPECT_THAT(daemon->requests(), ElementsAre("startRecordingWindowLayerContextIDs",
                                                "stopRecordingWithHandler", "saveVideoToCameraRoll"));
}

TEST_F(KelvoctlRecordingTest, WholeScreenIsAskedForInTheSizeAndWithTheMicrophoneOfTheLine) {
    EXPECT_EQ(
        KelvoctlProcess::run(socket, {"record", "--size=800x600", "--microphone", "--seconds=0.05"}).first,
        0);
    ASSERT_FALSE(daemon->arguments().empty());
    EXPECT_EQ(daemon->arguments()[0], (Array{Array(), 800.0, 600.0, true, false, false, true, false, false}));
}

TEST_F(KelvoctlRecordingTest, RecordingEndsAfterItsSeconds) {
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_EQ(KelvoctlProcess::run(socket, {"record", "--seconds", "0.2"}).first, 0);
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(200));
}

TEST_F(KelvoctlRecordingTest, OutputGetsTheMovieAndTheLibraryDoesNot) {
    const std::string output = root.path() + "/out.mp4";
    const Answer answer = KelvoctlProcess::run(socket, {"record", "--seconds=0.05", "--output", output});
    EXPECT_EQ(answer.first, 0) << answer.second;
    EXPECT_EQ(contentOf("out.mp4"), "pixels");
    EXPECT_THAT(daemon->requests(), ElementsAre("startRecordingWindowLayerContextIDs",
                                                "stopRecordingWithHandler", "discardRecordingWithHandler"));
}

TEST_F(KelvoctlRecordingTest, MovieThatCannotBePutThereIsSavedInstead) {
    KelvoctlProcess record(socket, {"record", "--output", root.path() + "/folder/out.mp4"});
    EXPECT_EQ(record.waitForExit(), 2);
    std::filesystem::create_directory(root.path() + "/folder");
    KelvoctlProcess again(socket, {"record", "--output", root.path() + "/folder/out.mp4"});
    ASSERT_TRUE(again.waitForLine("recording;"));
    std::filesystem::remove(root.path() + "/folder");
    again.signal(SIGINT);
    EXPECT_EQ(again.waitForExit(), 0);
    EXPECT_NE(again.output().find("cannot put it there"), std::string::npos) << again.output();
    EXPECT_EQ(daemon->requests().back(), "saveVideoToCameraRoll");
}

TEST_F(KelvoctlRecordingTest, ErrorsOfTheDaemonAreTold) {
    daemon->startError.set(errorSaying("cannot start"));
    EXPECT_EQ(KelvoctlProcess::run(socket, {"record"}), Answer(1, "kelvoctl: cannot start (domain -5804)\n"));
    EXPECT_EQ(KelvoctlProcess::answer(socket, {"record", "--json"}),
              "{\"error\":{\"domain\":\"domain\",\"code\":-5804,\"description\":\"cannot start\"}}\n");
}

TEST_F(KelvoctlRecordingTest, FailureToSaveIsTold) {
    daemon->saveError.set(errorSaying("library full"));
    const Answer answer = KelvoctlProcess::run(socket, {"record", "--seconds=0.05"});
    EXPECT_EQ(answer.first, 1);
    EXPECT_NE(answer.second.find("kelvoctl: library full (domain -5804)\n"), std::string::npos)
        << answer.second;
}

TEST_F(KelvoctlRecordingTest, StopThatFailsIsTold) {
    daemon->movie.set(std::nullopt);
    daemon->stopError.set(errorSaying("cannot finish"));
    EXPECT_EQ(KelvoctlProcess::run(socket, {"record", "--seconds=0.05"}).first, 1);
    daemon->stopError.set(std::nullopt);
    EXPECT_EQ(KelvoctlProcess::run(socket, {"record", "--seconds=0.05"}).first, 1);
}

TEST_F(KelvoctlRecordingTest, SecondRecordingIsRefusedAndTheFirstGoesOn) {
    daemon->isRecording = true;
    EXPECT_EQ(KelvoctlProcess::run(socket, {"record"}).first, 4);
    EXPECT_TRUE(daemon->requests().empty());
}

TEST_F(KelvoctlRecordingTest, StopStopsAndSavesWhatSomebodyElseStarted) {
    daemon->isRecording = true;
    EXPECT_EQ(KelvoctlProcess::run(socket, {"stop"}),
              Answer(0, "saving; this takes a while after a long recording\nsaved to the library\n"));
    EXPECT_THAT(daemon->requests(), ElementsAre("stopRecordingWithHandler", "saveVideoToCameraRoll"));
}

TEST_F(KelvoctlRecordingTest, PauseOfAWholeScreenIsSaidToDoNothing) {
    daemon->isRecording = true;
    const Answer answer = KelvoctlProcess::run(socket, {"pause"});
    EXPECT_EQ(answer,
              Answer(1, "kelvoctl: the daemon does not pause a recording of the whole screen; it goes on\n"));
    EXPECT_THAT(daemon->requests(), ElementsAre("pauseRecording"));
}

TEST_F(KelvoctlRecordingTest, RecordingThatTheSystemEndsIsToldWithItsReason) {
    KelvoctlProcess record(socket, {"record"});
    ASSERT_TRUE(record.waitForLine("recording;"));
    client().recordingDidStopWithError(errorSaying("a call came"), std::nullopt);
    EXPECT_EQ(record.waitForExit(), 1);
    EXPECT_NE(record.output().find("kelvoctl: a call came (domain -5804)\n`kelvoctl library` tells"),
              std::string::npos)
        << record.output();
}

TEST_F(KelvoctlRecordingTest, RecordingThatEndsBeforeItsStartIsAnsweredIsTold) {
    const KVError error("domain", -5817, {{std::string(kLocalizedDescriptionKey), "no screen"}});
    // A copy: the thread that calls this lives longer than the test's own variables.
    daemon->beforeStartIsAnswered.set(
        [this, error] { client().recordingDidStopWithError(error, std::nullopt); });
    KelvoctlProcess record(socket, {"record"});
    EXPECT_EQ(record.waitForExit(), 1);
    EXPECT_NE(record.output().find("kelvoctl: no screen (domain -5817)\n"), std::string::npos)
        << record.output();
    EXPECT_EQ(record.output().find("the daemon has no display"), std::string::npos);
}

TEST_F(KelvoctlRecordingTest, RecordingThatTheDeviceLockEndsIsToldWithItsReason) {
    KelvoctlProcess record(socket, {"record"});
    ASSERT_TRUE(record.waitForLine("recording;"));
    client().recordingLockInterrupted(errorSaying("locked"));
    EXPECT_EQ(record.waitForExit(), 1);
    EXPECT_NE(record.output().find("kelvoctl: locked"), std::string::npos);
}

TEST_F(KelvoctlRecordingTest, RecordingThatSomebodyElseStopsEnds) {
    KelvoctlProcess record(socket, {"record"});
    ASSERT_TRUE(record.waitForLine("recording;"));
    client().updateScreenRecordingState();  // it began; still runs
    daemon->isRecording = false;
    client().updateScreenRecordingState();
    EXPECT_EQ(record.waitForExit(), 0);
    EXPECT_NE(record.output().find("stopped from elsewhere"), std::string::npos);
}

TEST_F(KelvoctlRecordingTest, OutputThatSomebodyElsesStopLeavesUnwrittenIsAFailure) {
    KelvoctlProcess record(socket, {"record", "--output", root.path() + "/out.mp4"});
    ASSERT_TRUE(record.waitForLine("recording;"));
    daemon->isRecording = false;
    client().updateScreenRecordingState();
    EXPECT_EQ(record.waitForExit(), 1);
    EXPECT_FALSE(std::filesystem::exists(root.path() + "/out.mp4"));
}

TEST_F(KelvoctlRecordingTest, SecondCtrlCLeavesWithoutWaiting) {
    daemon->staysSilent = true;
    KelvoctlProcess record(socket, {"record"});
    ASSERT_TRUE(record.waitForLine("recording;"));
    record.signal(SIGINT);
    ASSERT_TRUE(test::eventually([this] { return !daemon->isRecording; }));
    record.signal(SIGINT);
    EXPECT_EQ(record.waitForExit(), std::nullopt);  // the signal ended it
}

TEST_F(KelvoctlRecordingTest, ExtensionsAreListed) {
    EXPECT_EQ(KelvoctlProcess::run(socket, {"extensions"}), Answer(0, "One\t\nTwo\t\n"));
    EXPECT_EQ(KelvoctlProcess::answer(socket, {"extensions", "--json"}),
              "{\"displayName\":\"One\"}\n{\"displayName\":\"Two\"}\n");
}

}  // namespace
}  // namespace kelvo
