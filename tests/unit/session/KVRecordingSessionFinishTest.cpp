#include "SessionFixture.h"

#include <cerrno>

#include <gmock/gmock.h>

namespace kelvo::test {
namespace {

const URL kMovie = URL::file("/movie.mp4");

TEST_F(SessionFixture, FinishYieldsTheMovie) {
    start();
    EXPECT_TRUE(finish().empty());
    EXPECT_FALSE(session->isRecording());
    completeMovie(kMovie);
    ASSERT_EQ(outcomes.size(), 1U);
    EXPECT_EQ(outcomes.front().movieURL, kMovie);
    EXPECT_EQ(outcomes.front().errorCode, 0);
    EXPECT_TRUE(log.contains("KVRecordingSession: finishSessionWithHandler"));
    EXPECT_TRUE(log.contains("KVRecordingSession: finishWritingWithHandler"));
    EXPECT_TRUE(delegate->stops.empty());
}

TEST_F(SessionFixture, MovieLastsUntilTheCaptureEnds) {
    start();
    device.clock->advance(std::chrono::seconds(7));
    const auto end = device.clock->monotonicNow();
    finish();
    EXPECT_THAT(writer->captureEnds, testing::ElementsAre(at(end.count())));
}

TEST_F(SessionFixture, MovieOfAPausedRecordingEndsWithThePause) {
    start();
    session->pauseSession();
    finish();
    EXPECT_THAT(writer->captureEnds, testing::IsEmpty());
}

TEST_F(SessionFixture, MovieOfASessionThatIsGoneIsStillHandedOver) {
    start();
    finish(5, 2);
    session.reset();
    completeMovie(kMovie);
    ASSERT_EQ(outcomes.size(), 1U);
    EXPECT_EQ(outcomes.front().movieURL, kMovie);
}

TEST_F(SessionFixture, FinishOfAnIdleSessionIsNeverAnswered) {
    EXPECT_TRUE(finish().empty());
    EXPECT_FALSE(log.contains("KVRecordingSession: finishSessionWithHandler"));
}

TEST_F(SessionFixture, FinishWithoutDurationsIsFinishWithBothZero) {
    start();
    std::optional<URL> received;
    session->finishSessionWithHandler([&](const auto& url, const auto&) { received = url; });
    completeMovie(kMovie);
    EXPECT_EQ(received, kMovie);
    EXPECT_TRUE(writer->trims.empty());
}

TEST_F(SessionFixture, MissingMovieIsAnError) {
    start();
    finish();
    completeMovie(std::nullopt);
    ASSERT_EQ(outcomes.size(), 1U);
    EXPECT_EQ(outcomes.front().movieURL, std::nullopt);
    EXPECT_EQ(outcomes.front().errorCode, -5812);
}

TEST_F(SessionFixture, SessionWithoutAWriterHasNoMovie) {
    session->setRecording(true);
    EXPECT_EQ(finish().size(), 1U);
    EXPECT_EQ(outcomes.front().errorCode, -5812);
}

TEST_F(SessionFixture, CaptureNeedsNoMovie) {
    session->setCaptureRecording(true);
    start();
    finish();
    completeMovie(std::nullopt);
    ASSERT_EQ(outcomes.size(), 1U);
    EXPECT_EQ(outcomes.front().errorCode, 0);
}

TEST_F(SessionFixture, BothDurationsTrim) {
    start();
    finish(5, 2);
    completeMovie(kMovie);
    ASSERT_EQ(writer->trims.size(), 1U);
    EXPECT_EQ(writer->trims.front().url, kMovie);
    EXPECT_EQ(writer->trims.front().start, 5);
    EXPECT_EQ(writer->trims.front().end, 2);
    EXPECT_EQ(outcomes.front().movieURL, session->trimmedOutputURL());
    EXPECT_TRUE(log.contains("trimming"));
    EXPECT_TRUE(log.contains("finished trimming"));
}

TEST_F(SessionFixture, OneDurationDoesNotTrim) {
    for (const auto& [startClip, endClip] : {std::pair{5.0, 0.0}, {0.0, 5.0}, {5.0, -1.0}}) {
        outcomes.clear();
        start();
        finish(startClip, endClip);
        completeMovie(kMovie);
        EXPECT_TRUE(writer->trims.empty());
        EXPECT_EQ(outcomes.front().movieURL, kMovie);
    }
}

TEST_F(SessionFixture, LastFragmentGoesToTheExtension) {
    const auto link = broadcast(BroadcastProcessMode::movieClips);
    start();
    finish(5, 2);
    completeMovie(kMovie);
    ASSERT_EQ(link->movies.size(), 1U);
    EXPECT_EQ(link->movies.front(), (std::pair{std::optional(kMovie), true}));
    EXPECT_EQ(outcomes.front().movieURL, std::nullopt);
    EXPECT_EQ(outcomes.front().errorCode, 0);
    EXPECT_TRUE(writer->trims.empty());
}

TEST_F(SessionFixture, SampleBroadcastIsFinishedByTheExtension) {
    const auto link = broadcast(BroadcastProcessMode::sampleBuffers);
    start();
    link->completions.front()();
    finish();
    EXPECT_EQ(link->actions.back(), ExtensionAction::finish);
    EXPECT_TRUE(outcomes.empty());
    link->completions.back()();
    ASSERT_EQ(outcomes.size(), 1U);
    EXPECT_EQ(outcomes.front().movieURL, std::nullopt);
    EXPECT_EQ(outcomes.front().errorCode, 0);
    EXPECT_EQ(link->invalidations, 1);
}

TEST_F(SessionFixture, SampleBroadcastIsAnsweredAlsoWhenItsSessionIsGone) {
    const auto link = broadcast(BroadcastProcessMode::sampleBuffers);
    start();
    link->completions.front()();
    finish();
    session.reset();
    link->completions.back()();
    EXPECT_EQ(outcomes.size(), 1U);
    EXPECT_EQ(link->invalidations, 0);
}

TEST_F(SessionFixture, FinishResetsTheTimelineButNotItsBeginning) {
    start();
    frame(1000);
    session->pauseSession();
    session->resumeSessionWithContextID(11);
    frame(5000);
    EXPECT_FALSE(session->sampleTimeOffset().isZero());
    const MediaTime first = session->firstSampleTimestamp();
    finish();
    EXPECT_FALSE(session->lastSampleTimestamp().isValid());
    EXPECT_TRUE(session->sampleTimeOffset().isZero());
    EXPECT_EQ(session->firstSampleTimestamp(), first);
}

TEST_F(SessionFixture, CleanUpRemovesTheFileAndStops) {
    start();
    device.fileSystem->addFile(writer->outputPath, 10);
    int completions = 0;
    session->finishAndCleanupSessionFilesWithHandler([&] { ++completions; });
    GlobalQueue::drain();
    EXPECT_EQ(completions, 1);
    EXPECT_FALSE(session->isRecording());
    EXPECT_FALSE(device.fileSystem->itemExists(writer->outputPath));
    EXPECT_FALSE(writer->finishHandler) << "the writer is not finished";
    EXPECT_TRUE(log.contains("KVRecordingSession: cleanupSessionFiles"));
}

TEST_F(SessionFixture, CleanUpOfASystemRecordingMissesTheFileWhenASecondHasPassed) {
    makeSystemSession();
    start();
    device.fileSystem->addFile(writer->outputPath, 10);
    device.advance(std::chrono::seconds(1));
    session->finishAndCleanupSessionFilesWithHandler(nullptr);
    GlobalQueue::drain();
    EXPECT_TRUE(device.fileSystem->itemExists(writer->outputPath));
}

TEST_F(SessionFixture, FailedCleanUpIsLoggedAndAnswered) {
    start();
    device.fileSystem->addFile(writer->outputPath, 10);
    device.failNext("FileSystem.removeItem", EACCES);
    int completions = 0;
    session->finishAndCleanupSessionFilesWithHandler([&] { ++completions; });
    GlobalQueue::drain();
    EXPECT_EQ(completions, 1);
    EXPECT_TRUE(log.contains("error removing file with code: 13"));
}

}  // namespace
}  // namespace kelvo::test
