#include "SessionFixture.h"
#include "session/SampleRebase.h"

#include <limits>

namespace kelvo::test {
namespace {

constexpr std::int64_t kSecond = 1000000000;

/// Frames are given to the session by hand, so that their times are known.
class Pipeline : public SessionFixture {
  protected:
    void begin() {
        start();
        // The frame that the simulated screen delivers by itself is not wanted here.
        if (writer) writer->video.clear();
        if (writer) writer->transforms.clear();
        captureManager->startTimes.clear();
        client->frames.clear();
        delegate->durations.clear();
    }
    void pauseAndResume() {
        session->pauseSession();
        session->resumeSessionWithContextID(11);
        device.screen->setMode(MirroringMode::off);
    }
};

TEST_F(Pipeline, FrameGoesIntoTheMovieAsItIs) {
    begin();
    const auto sample = videoSample(1000);
    session->screenCaptureControllerDidReceiveSampleBuffer(*source, sample, {});
    ASSERT_EQ(writer->video.size(), 1U);
    EXPECT_EQ(writer->video.front(), sample) << "not even a copy";
    EXPECT_TRUE(log.contains("Screen sampled at w:108 h:192"));
    EXPECT_TRUE(
        log.contains("KVRecordingSession:screenCaptureController:didReceiveSampleBuffer:transformFlags:"));
    EXPECT_EQ(session->lastSampleTimestamp(), at(1000));
}

TEST_F(Pipeline, CallbackWithoutASampleDoesNothing) {
    begin();
    session->screenCaptureControllerDidReceiveSampleBuffer(*source, nullptr, {});
    EXPECT_TRUE(writer->video.empty());
    EXPECT_TRUE(delegate->durations.empty());
}

TEST_F(Pipeline, FramesAreCounted) {
    begin();
    const auto before = session->reportingAgent()->videoFrameCount();
    frame(1000);
    frame(2000);
    EXPECT_EQ(session->reportingAgent()->videoFrameCount(), before + 2);
}

TEST_F(Pipeline, FirstFrameOfTheSessionFixesTheBeginningForGood) {
    session->setRecording(true);
    frame(3 * kSecond);
    EXPECT_EQ(session->firstSampleTimestamp(), at(3 * kSecond));
    frame(4 * kSecond);
    session->pauseSession();
    session->resumeSessionWithContextID(1);
    EXPECT_EQ(session->firstSampleTimestamp(), at(3 * kSecond));
}

TEST_F(Pipeline, DurationCountsFromTheFirstFrame) {
    frame(3 * kSecond);
    frame(5 * kSecond + kSecond / 2);
    EXPECT_EQ(delegate->durations, (std::vector<double>{0, 2.5}));
}

TEST_F(Pipeline, DurationGoesOnThroughPauses) {
    session->setRecording(true);
    frame(kSecond);
    session->pauseSession();
    session->resumeSessionWithContextID(11);
    frame(11 * kSecond);
    EXPECT_EQ(delegate->durations, (std::vector<double>{0, 10}));
}

TEST_F(Pipeline, PausedFrameIsDiscardedAndLeavesTheLockTaken) {
    begin();
    session->setPaused(true);
    frame(1000);
    EXPECT_TRUE(writer->video.empty());
    EXPECT_EQ(log.count("session is paused discard sample"), 1U);
    EXPECT_EQ(delegate->durations.size(), 1U);
    session->setPaused(false);
    frame(2000);
    EXPECT_TRUE(writer->video.empty()) << "nothing gets past the lock until the session is resumed";
    EXPECT_EQ(log.count("session is paused discard sample"), 1U);
}

TEST_F(Pipeline, RecordingGoesOnAfterAFrameThatCameWhilePausing) {
    begin();
    frame(1000);
    session->setPaused(true);
    frame(2000);
    frame(3000);  // does not wait for the lock
    session->resumeSessionWithContextID(11);
    frame(4000);
    EXPECT_EQ(writer->videoValues().back(), 1000) << "the pause is cut out";
    frame(4500);
    EXPECT_EQ(writer->videoValues().back(), 1500);
}

TEST_F(Pipeline, NewRecordingGoesOnAfterAFrameThatCameWhilePausing) {
    begin();
    session->setPaused(true);
    frame(2000);
    finish();
    begin();
    frame(5000);
    EXPECT_EQ(writer->video.size(), 1U);
}

TEST_F(Pipeline, ResetAfterAFrameThatCameWhilePausingStops) {
    begin();
    session->setPaused(true);
    frame(2000);
    session->screenCaptureControllerMediaServicesWereReset(*source);
    EXPECT_EQ(delegate->stops, std::vector<std::int64_t>{-5817});
}

TEST_F(Pipeline, FirstFrameAfterAPauseTakesTheTimeOfTheLastBeforeIt) {
    begin();
    frame(1000);
    frame(2000);
    pauseAndResume();
    frame(7000);
    EXPECT_EQ(session->sampleTimeOffset(), at(5000));
    EXPECT_EQ(session->lastSampleTimestamp(), at(2000)) << "not moved by the resumed frame";
    EXPECT_FALSE(session->sessionWasResumed());
    frame(7500);
    EXPECT_EQ(session->lastSampleTimestamp(), at(7500));
    EXPECT_EQ(writer->videoValues(), (std::vector<std::int64_t>{1000, 2000, 2000, 2500}));
}

TEST_F(Pipeline, TwoPausesAddUp) {
    begin();
    frame(1000);
    pauseAndResume();
    frame(5000);  // gap 4000
    frame(6000);
    pauseAndResume();
    frame(16000);  // gap 10000
    EXPECT_EQ(session->sampleTimeOffset(), at(14000));
    frame(17000);
    EXPECT_EQ(writer->videoValues(), (std::vector<std::int64_t>{1000, 1000, 2000, 2000, 3000}));
}

TEST_F(Pipeline, RebasedFrameSharesItsPictureAndMovesTheCapturesTime) {
    begin();
    frame(1000);
    pauseAndResume();
    const auto sample = videoSample(5000);
    session->screenCaptureControllerDidReceiveSampleBuffer(*source, sample, {});
    const auto rebased = writer->video.back();
    EXPECT_NE(rebased, sample);
    EXPECT_EQ(rebased->surface(), sample->surface());
    EXPECT_EQ(rebased->duration(), at(5));
    EXPECT_FALSE(rebased->decodeTime().isValid());
    EXPECT_EQ(captureManager->startTimes, std::vector{at(1000)});
    EXPECT_EQ(sample->presentationTime(), at(5000)) << "the original is untouched";
}

TEST_F(Pipeline, FirstFrameLetsApplicationAudioInOnce) {
    session->setRecording(true);
    frame(1000);
    frame(2000);
    EXPECT_EQ(captureManager->startTimes, std::vector{at(1000)});
}

TEST_F(Pipeline, FirstFrameOfTheNextRecordingLetsApplicationAudioInAgain) {
    start();
    finish();
    captureManager->startTimes.clear();
    session->setRecording(true);
    session->startSessionWithHandler(nullptr);
    frame(9 * kSecond);
    frame(10 * kSecond);
    EXPECT_EQ(captureManager->startTimes, std::vector{at(9 * kSecond)});
}

TEST_F(Pipeline, EveryPauseEndsInATimeForApplicationAudio) {
    begin();
    frame(1000);
    pauseAndResume();
    frame(5000);
    EXPECT_EQ(captureManager->calls.back(), "stop all") << "which forgets the time from before the pause";
    EXPECT_EQ(captureManager->startTimes, std::vector{at(1000)});
    frame(6000);
    captureManager->startTimes.clear();
    pauseAndResume();
    frame(9000);
    EXPECT_EQ(captureManager->startTimes, std::vector{at(2000)});
}

/// A session whose samples cannot be copied.
class UncopyingSession : public KVRecordingSession {
  public:
    using KVRecordingSession::KVRecordingSession;

  protected:
    SampleBufferRef _copySampleBufferFromSourceBuffer(const SampleBufferRef&,
                                                      const MediaTime&) const override {
        return nullptr;
    }
};

TEST_F(Pipeline, FrameThatCannotBeCopiedIsUsedUnmodified) {
    struct Openable : UncopyingSession {
        Openable(std::string bundleID, Services services)
            : UncopyingSession(std::move(bundleID), std::move(services)) {}
    };
    session = std::make_shared<Openable>("com.example.paint", services());
    configure();
    begin();
    frame(1000);
    pauseAndResume();
    frame(5000);
    EXPECT_EQ(writer->videoValues().back(), 5000);
    EXPECT_TRUE(captureManager->startTimes.empty());
}

TEST_F(Pipeline, TimingCountThatOverflowsYieldsNoCopy) {
    const TimingRecord one;
    const auto count = std::numeric_limits<std::uint64_t>::max() / sizeof(TimingRecord) + 1;
    EXPECT_FALSE(rebasedTiming(std::span(&one, count), at(1)));
    EXPECT_TRUE(log.contains("KVRecordingSession: _copySampleBufferFromSourceBuffer: Overflow detected"));
}

TEST_F(Pipeline, EveryTimingRecordIsRebased) {
    const std::vector<TimingRecord> timing{{at(1), at(10), at(11)}, {at(2), at(20), at(21)}};
    const auto rebased = rebasedTiming(timing, at(5));
    ASSERT_TRUE(rebased);
    EXPECT_EQ(*rebased, (std::vector<TimingRecord>{{at(1), at(5), MediaTime::invalid()},
                                                   {at(2), at(5), MediaTime::invalid()}}));
}

TEST_F(Pipeline, TransformOfASystemRecordingFollowsTheScreen) {
    makeSystemSession();
    begin();
    const ScreenTransform turned{1, false};
    frame(1000, turned);
    EXPECT_EQ(writer->transforms.back(), affineTransform(turned, {108, 192}));
}

TEST_F(Pipeline, TransformOfAnInAppRecordingIsTheIdentity) {
    begin();
    frame(1000, {1, true});
    EXPECT_EQ(writer->transforms.back(), AffineTransform());
}

TEST_F(Pipeline, SampleBroadcastSendsFramesWithTheirOrientation) {
    const auto link = broadcast(BroadcastProcessMode::sampleBuffers);
    begin();
    frame(1000, {1, false});
    ASSERT_EQ(link->samples.size(), 1U);
    EXPECT_EQ(link->samples.front().first, SampleBuffer::Type::video);
    EXPECT_EQ(link->orientations, std::vector<std::uint32_t>{6});
    EXPECT_EQ(session->reportingAgent()->videoFrameCount(), 1);
}

TEST_F(Pipeline, SampleBroadcastWinsOverCapture) {
    const auto link = broadcast(BroadcastProcessMode::sampleBuffers);
    session->setCaptureRecording(true);
    begin();
    frame(1000);
    EXPECT_EQ(link->samples.size(), 1U);
    EXPECT_TRUE(client->frames.empty());
}

TEST_F(Pipeline, ClipBroadcastWritesFrames) {
    const auto link = broadcast(BroadcastProcessMode::movieClips);
    begin();
    frame(1000);
    EXPECT_EQ(writer->video.size(), 1U);
    EXPECT_TRUE(link->samples.empty());
}

TEST_F(Pipeline, CaptureSharesTheSurfaceWithTheClient) {
    session->setCaptureRecording(true);
    begin();
    frame(1000);
    ASSERT_EQ(client->frames.size(), 1U);
    EXPECT_EQ(client->frames.front().first, surface);
    EXPECT_EQ(client->frames.front().second, (TimingRecord{at(5), at(1000), at(1000)}));
    EXPECT_TRUE(writer->video.empty());
    EXPECT_GE(session->reportingAgent()->videoFrameCount(), 1);
}

TEST_F(Pipeline, CaptureWithoutAClientDropsItsSamples) {
    session->setCaptureRecording(true);
    begin();
    session->setClientProxy(nullptr);
    frame(1000);
    session->processAppAudioSample(audioSample(1));
    EXPECT_TRUE(client->frames.empty() && client->sounds.empty());
}

TEST_F(Pipeline, WriterThatRefusesAFrameEndsTheRecording) {
    begin();
    writer->acceptsVideo = false;
    frame(1000);
    EXPECT_FALSE(session->isRecording());
    EXPECT_EQ(delegate->stops, std::vector<std::int64_t>{-5812});
}

TEST_F(Pipeline, ScreenFailureEndsTheRecording) {
    begin();
    device.screen->fail(ScreenCaptureStatus::lost);
    EXPECT_FALSE(session->isRecording());
    EXPECT_EQ(delegate->stops, std::vector<std::int64_t>{-5817});
    EXPECT_TRUE(log.contains("KVRecordingSession: screenCaptureController: didFailWithStatus:"));
}

TEST_F(Pipeline, PreemptionEndsTheRecording) {
    begin();
    device.screen->preempt();
    EXPECT_FALSE(session->isRecording());
    EXPECT_EQ(delegate->stops, std::vector<std::int64_t>{-5806});
    EXPECT_TRUE(log.contains("KVRecordingSession: screenCaptureControllerWasPreempted"));
}

TEST_F(Pipeline, ResetEndsTheRecordingAndEveryLaterFrameIsIgnored) {
    begin();
    device.screen->resetMediaServices();
    EXPECT_FALSE(session->isRecording());
    EXPECT_EQ(delegate->stops, std::vector<std::int64_t>{-5817});
    EXPECT_TRUE(log.contains("KVRecordingSession: screenCaptureControllerMediaServicesWereReset"));
    const auto before = writer->video.size();
    frame(1000);
    frame(2000);
    EXPECT_EQ(writer->video.size(), before);
}

TEST_F(Pipeline, NextStartForgetsTheReset) {
    begin();
    device.screen->resetMediaServices();
    begin();
    frame(1000);
    EXPECT_EQ(writer->video.size(), 1U);
}

TEST_F(Pipeline, FailureReportsItsReason) {
    begin();
    device.screen->preempt();
    ASSERT_EQ(device.analytics->messages().size(), 1U);
    EXPECT_EQ(device.analytics->messages().front().payload.find("EndReason")->asInteger(), -5806);
}

TEST_F(Pipeline, FramesBeforeTheWriterExistsAreDropped) {
    frame(1000);
    EXPECT_EQ(session->lastSampleTimestamp(), at(1000));
}

}  // namespace
}  // namespace kelvo::test
