#include "SessionFixture.h"

namespace kelvo::test {
namespace {

using namespace std::chrono_literals;

TEST_F(SessionFixture, StartMakesTheWriterAndCapturesOnceItIsReady) {
    session->setRecording(true);
    const auto configuration = std::make_shared<KVBroadcastConfiguration>();
    session->setBroadcastConfiguration(configuration);
    session->startSessionWithHandler([this] { ++startCompletions; });
    ASSERT_TRUE(writer);
    EXPECT_EQ(writer->windowSize, (Size{108, 192}));
    EXPECT_EQ(writer->outputPath, session->outputPath());
    EXPECT_EQ(writer->broadcastConfig, configuration);
    EXPECT_FALSE(writer->systemRecording);
    EXPECT_EQ(session->movieWriter(), writer);
    EXPECT_EQ(device.screen->mode(), MirroringMode::off);
    EXPECT_EQ(startCompletions, 0);

    writer->startHandler();
    EXPECT_EQ(startCompletions, 1);
    EXPECT_EQ(device.screen->mode(), MirroringMode::cloneContexts);
    EXPECT_EQ(device.screen->cloneContexts(), (std::set<std::uint32_t>{11, 12}));
    EXPECT_EQ(session->captureStartTime(), device.clock->now());
    EXPECT_TRUE(log.contains("KVRecordingSession: startSession"));
    EXPECT_TRUE(log.contains("kelvo mode"));
    EXPECT_TRUE(log.contains("starting capture with VelaCaptureController"));
    device.screen->catchUp();
    EXPECT_EQ(writer->video.size(), 1U);
}

TEST_F(SessionFixture, StartNeedsNoCompletion) {
    session->setRecording(true);
    session->startSessionWithHandler(nullptr);
    writer->startHandler();
    EXPECT_EQ(device.screen->mode(), MirroringMode::cloneContexts);
}

TEST_F(SessionFixture, SystemRecordingMirrorsTheWholeScreen) {
    makeSystemSession();
    start();
    EXPECT_EQ(device.screen->mode(), MirroringMode::wholeScreen);
    EXPECT_TRUE(writer->systemRecording);
    EXPECT_TRUE(log.contains("mirror mode"));
}

struct OrientationRow {
    bool isSystem;
    float orientation;
    Size given;
    Size expected;
};

TEST_F(SessionFixture, WriterGetsTheSizeAsTheScreenWasBuilt) {
    for (const OrientationRow& row : {OrientationRow{true, 90, {1080, 1920}, {1920, 1080}},
                                      OrientationRow{true, 90, {1920, 1080}, {1920, 1080}},
                                      OrientationRow{true, 0, {1920, 1080}, {1080, 1920}},
                                      OrientationRow{true, 0, {1080, 1920}, {1080, 1920}},
                                      OrientationRow{false, 90, {1080, 1920}, {1080, 1920}},
                                      OrientationRow{false, 0, {1920, 1080}, {1920, 1080}}}) {
        makeSession("com.example.paint");
        session->setSystemRecording(row.isSystem);
        device.device->setMainScreenOrientation(row.orientation);
        session->setWindowSize(row.given);
        session->startSessionWithHandler(nullptr);
        EXPECT_EQ(writer->windowSize, row.expected);
        EXPECT_EQ(session->windowSize(), row.given);
    }
    EXPECT_TRUE(log.contains("Before windowSize w:1080.000000 h:1920.000000"));
    EXPECT_TRUE(log.contains("After windowSize w:1920.000000 h:1080.000000"));
}

TEST_F(SessionFixture, ReportHasSizeAndRate) {
    start();
    EXPECT_EQ(session->reportingAgent()->videoCaptureSize(), (Size{108, 192}));
    EXPECT_EQ(session->reportingAgent()->videoCaptureRate(), 60);
}

TEST_F(SessionFixture, BroadcastIsCapturedAtHalfTheRate) {
    broadcast(BroadcastProcessMode::movieClips);
    start();
    EXPECT_EQ(session->reportingAgent()->videoCaptureRate(), 30);
    EXPECT_EQ(session->reportingAgent()->serviceName(), "InAppBroadcast");
}

TEST_F(SessionFixture, SampleBroadcastStartsOnceTheExtensionKnows) {
    const auto link = broadcast(BroadcastProcessMode::sampleBuffers);
    start();
    EXPECT_EQ(writer, nullptr) << "no movie is written";
    EXPECT_EQ(link->actions, std::vector{ExtensionAction::start});
    EXPECT_EQ(device.screen->mode(), MirroringMode::off);
    link->completions.front()();
    EXPECT_EQ(device.screen->mode(), MirroringMode::cloneContexts);
    EXPECT_EQ(startCompletions, 1);
}

TEST_F(SessionFixture, SampleBroadcastWithoutAnExtensionStillStartsPausesAndResumes) {
    session->setBroadcastProcessMode(BroadcastProcessMode::sampleBuffers);
    start();
    EXPECT_EQ(startCompletions, 1);
    session->pauseSession();
    EXPECT_TRUE(session->isPaused());
    session->resumeSessionWithContextID(5);
    EXPECT_FALSE(session->isPaused());
}

TEST_F(SessionFixture, ApplicationAudioIsTappedBeforeTheFirstFrame) {
    session->setFrontmostPIDForAudioTap(kClientPID);
    start();
    EXPECT_TRUE(captureManager->called("start app audio 501"));
    EXPECT_TRUE(writer->video.empty());
    EXPECT_FALSE(log.contains("starting capture with VelaCaptureController"));
    captureManager->appAudioDidStart();
    EXPECT_TRUE(log.contains("starting capture with VelaCaptureController"));
    device.screen->catchUp();
    EXPECT_EQ(writer->video.size(), 1U);
}

TEST_F(SessionFixture, ProcessBelowOneIsNotTapped) {
    session->setFrontmostPIDForAudioTap(-1);
    start();
    EXPECT_FALSE(captureManager->called("start app audio -1"));
    EXPECT_EQ(writer->video.size(), 1U);
}

TEST_F(SessionFixture, CaptureThatWasStoppedWhileTheWriterGotReadyDoesNotBegin) {
    session->setRecording(true);
    session->startSessionWithHandler([this] { ++startCompletions; });
    finish();
    writer->startHandler();
    EXPECT_EQ(startCompletions, 1);
    EXPECT_EQ(device.screen->mode(), MirroringMode::off);
    EXPECT_FALSE(log.contains("starting capture with VelaCaptureController"));
}

TEST_F(SessionFixture, CaptureThatWasStoppedWhileTheTapGotReadyDoesNotBegin) {
    session->setFrontmostPIDForAudioTap(kClientPID);
    start();
    finish();
    captureManager->appAudioDidStart();
    device.screen->catchUp();
    EXPECT_TRUE(writer->video.empty());
    EXPECT_FALSE(log.contains("starting capture with VelaCaptureController"));
}

TEST_F(SessionFixture, SessionThatWentWhileTheWriterGotReadyIsStillAnswered) {
    session->startSessionWithHandler([this] { ++startCompletions; });
    session.reset();
    writer->startHandler();
    EXPECT_EQ(startCompletions, 1);
}

TEST_F(SessionFixture, PauseStopsCapturingOnce) {
    const auto link = broadcast(BroadcastProcessMode::sampleBuffers);
    start();
    link->completions.front()();
    session->pauseSession();
    session->pauseSession();
    EXPECT_TRUE(session->isPaused());
    EXPECT_TRUE(session->isRecording());
    EXPECT_EQ(link->actions, (std::vector{ExtensionAction::start, ExtensionAction::pause}));
    EXPECT_EQ(device.screen->mode(), MirroringMode::off);
    EXPECT_EQ(log.count("KVRecordingSession: pauseSession"), 1U);
    EXPECT_EQ(log.count("KVRecordingSession: stopAllCapture"), 1U);
    EXPECT_EQ(log.count("Stop mirroring"), 1U);
    EXPECT_TRUE(captureManager->called("stop all"));
}

TEST_F(SessionFixture, NoFrameComesWhilePaused) {
    start();
    showFrame();
    const auto before = writer->video.size();
    session->pauseSession();
    showFrame();
    EXPECT_EQ(writer->video.size(), before);
}

TEST_F(SessionFixture, ResumeGoesOnWithTheGivenWindow) {
    const auto link = broadcast(BroadcastProcessMode::sampleBuffers);
    start();
    link->completions.front()();
    session->pauseSession();
    session->resumeSessionWithContextID(99);
    EXPECT_FALSE(session->isPaused());
    EXPECT_TRUE(session->sessionWasResumed());
    EXPECT_EQ(session->contextIDs(), std::vector<std::uint32_t>{99});
    EXPECT_EQ(device.screen->cloneContexts(), std::set<std::uint32_t>{99});
    EXPECT_EQ(link->actions.back(), ExtensionAction::resume);
    EXPECT_TRUE(log.contains("KVRecordingSession: resumeSessionWithContextID:"));
}

TEST_F(SessionFixture, ResumeOfARunningSessionChangesNothing) {
    start();
    session->resumeSessionWithContextID(99);
    EXPECT_EQ(session->contextIDs(), (std::vector<std::uint32_t>{11, 12}));
    EXPECT_FALSE(session->sessionWasResumed());
    EXPECT_FALSE(log.contains("KVRecordingSession: resumeSessionWithContextID:"));
}

TEST_F(SessionFixture, WriterGoesOnAfterAPause) {
    start();
    const auto first = writer;
    session->pauseSession();
    session->resumeSessionWithContextID(11);
    device.screen->catchUp();
    EXPECT_EQ(session->movieWriter(), first);
    EXPECT_EQ(first->video.size(), 2U);
}

TEST_F(SessionFixture, ActiveDurationAddsUpWithoutPauses) {
    start();
    const auto agent = session->reportingAgent();
    device.advance(10s);
    session->pauseSession();
    device.advance(100s);
    session->resumeSessionWithContextID(11);
    device.advance(5s);
    session->stopAllCapture();
    EXPECT_DOUBLE_EQ(agent->activeDuration(), 15);
}

TEST_F(SessionFixture, StopEndsTheRecordingAndTellsTheDelegate) {
    start();
    session->setBroadcasting(true);
    session->stopRecordingWithNotification(true, services().errors->kvUserErrorForCode(-5806));
    EXPECT_FALSE(session->isRecording());
    EXPECT_FALSE(session->isBroadcasting());
    EXPECT_EQ(delegate->stops, std::vector<std::int64_t>{-5806});
    EXPECT_TRUE(log.contains("KVRecordingSession: stop"));
    EXPECT_FALSE(session->haveMicTap());
}

TEST_F(SessionFixture, StopWithoutNotificationTellsNobody) {
    start();
    session->stopRecordingWithNotification(false, std::nullopt);
    EXPECT_TRUE(delegate->stops.empty());
}

TEST_F(SessionFixture, StopOfAnIdleSessionDoesNothing) {
    session->stopRecordingWithNotification(true, std::nullopt);
    EXPECT_TRUE(delegate->stops.empty());
    EXPECT_FALSE(log.contains("KVRecordingSession: stop"));
}

TEST_F(SessionFixture, SessionCanBeStartedAgain) {
    start();
    finish();
    completeMovie(std::nullopt);
    const auto firstWriter = writer;
    session->setPaused(true);
    start();
    EXPECT_NE(writer, firstWriter);
    EXPECT_FALSE(session->isPaused());
    EXPECT_TRUE(session->reportingAgent());
    EXPECT_EQ(writer->video.size(), 1U);
}

TEST_F(SessionFixture, SummaryIsReportedOncePerStart) {
    makeSystemSession();
    start();
    device.fileSystem->addFile(writer->outputPath, 12345);
    device.advance(3s);
    session->stopRecordingWithNotification(true, services().errors->kvUserErrorForCode(-5817));
    EXPECT_EQ(session->reportingAgent(), nullptr);
    session->setRecording(true);
    session->stopRecordingWithNotification(true, std::nullopt);
    ASSERT_EQ(device.analytics->messages().size(), 1U);
    const AnalyticsMessage message = device.analytics->messages().front();
    EXPECT_EQ(message.category, 1);
    EXPECT_EQ(message.serviceName, "SystemRecording");
    EXPECT_EQ(message.payload.find("EndReason")->asInteger(), -5817);
    EXPECT_EQ(message.payload.find("RecordedFileSize")->asInteger(), 12345);
    EXPECT_EQ(message.payload.find("ActiveDuration")->asInteger(), 3);
    EXPECT_EQ(message.payload.find("VideoFrameCount")->asInteger(), 1);
    EXPECT_TRUE(log.contains("recordedFileSize for URL 12345 bytes"));
}

TEST_F(SessionFixture, SizeOfAMissingFileIsReportedAsZero) {
    start();
    finish();
    ASSERT_EQ(device.analytics->messages().size(), 1U);
    EXPECT_EQ(device.analytics->messages().front().payload.find("RecordedFileSize")->asInteger(), 0);
    EXPECT_EQ(device.analytics->messages().front().payload.find("EndReason")->asInteger(), 0);
    EXPECT_TRUE(log.contains("error getting recordedFileSize :2"));
}

TEST_F(SessionFixture, SizeIsLookedUpOnlyForRecordings) {
    session->setCaptureRecording(true);
    start();
    device.fileSystem->addFile(writer->outputPath, 12345);
    finish();
    EXPECT_EQ(device.analytics->messages().front().payload.find("RecordedFileSize")->asInteger(), 0);
    EXPECT_FALSE(log.contains("recordedFileSize for URL 12345 bytes"));
}

TEST_F(SessionFixture, BackgroundedClientIsPaused) {
    start();
    session->clientApplicationDidEnterBackground();
    EXPECT_TRUE(session->isPaused());
    EXPECT_EQ(client->didPause, 1);
    EXPECT_EQ(delegate->background, 1);
    session->clientApplicationDidEnterBackground();
    EXPECT_EQ(client->didPause, 1) << "it is paused already";
}

TEST_F(SessionFixture, BackgroundedClientOfASystemSessionIsNotPaused) {
    makeSystemSession();
    start();
    session->clientApplicationDidEnterBackground();
    EXPECT_FALSE(session->isPaused());
    EXPECT_EQ(client->didPause, 0);
    EXPECT_EQ(delegate->background, 0);
}

TEST_F(SessionFixture, BackgroundedClientOfAnIdleSessionIsNotPaused) {
    session->clientApplicationDidEnterBackground();
    EXPECT_FALSE(session->isPaused());
}

TEST_F(SessionFixture, ForegroundedClientIsAskedToResumeInAnyCase) {
    session->clientApplicationDidEnterForeground();
    EXPECT_EQ(client->shouldResume, 1);
    EXPECT_EQ(delegate->foreground, 1);
    EXPECT_FALSE(session->isRecording());
}

TEST_F(SessionFixture, StopQuestionsReachTheWriter) {
    session->notifyRecordingMayBeStopped();  // no writer yet
    session->notifyRecordingResumed();
    start();
    session->notifyRecordingMayBeStopped();
    session->notifyRecordingResumed();
    EXPECT_EQ(writer->mayBeStopped, 1);
    EXPECT_EQ(writer->resumed, 1);
}

}  // namespace
}  // namespace kelvo::test
