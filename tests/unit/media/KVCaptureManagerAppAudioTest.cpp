#include "AppAudioFixture.h"
#include "support/Threads.h"

#include <cerrno>
#include <future>

namespace kelvo {
namespace {

using namespace std::chrono_literals;
using testing::Contains;
using testing::ElementsAre;
using testing::Not;

using KVCaptureManagerAppAudioTest = test::AppAudioFixture;

TEST_F(KVCaptureManagerAppAudioTest, StartSetsUpTheTapOfTheProcess) {
    startTap();
    EXPECT_EQ(log.texts(), startTexts);
    EXPECT_EQ(queue()->process(), kProcess);
    EXPECT_TRUE(queue()->isRunning());
    EXPECT_EQ(queue()->enqueuedCount(), 10U);
    EXPECT_TRUE(tap()->isRunning);
    EXPECT_EQ(tap()->currentPacket, 0);
    EXPECT_EQ(tap()->format, manager->audioBasicDescription());
    EXPECT_EQ(tapStarts, 1);
}

TEST_F(KVCaptureManagerAppAudioTest, BuffersOfTheDefaultFormatAreOfTheLargestSize) {
    startTap();
    EXPECT_EQ(tap()->bufferByteSize, 57344U);
    for (const auto& buffer : tap()->buffers)
        EXPECT_EQ(buffer->bytes.size(), 57344U);
}

TEST_F(KVCaptureManagerAppAudioTest, ListenerFiresOncePerStart) {
    startTap();
    EXPECT_FALSE(queue()->hasListener());
    queue()->notifyRunning();
    settle();
    EXPECT_EQ(tapStarts, 1);
}

TEST_F(KVCaptureManagerAppAudioTest, DidStartHandlerOfAStoppedTapIsNotCalled) {
    std::promise<void> release;
    KVCaptureManager::audioDispatchQueue().async([wait = release.get_future().share()] { wait.wait(); });
    manager->startAppAudioCaptureForProcessID(kProcess, collect(appAudio), countInto(tapStarts));
    test::BlockingCaller stop([this] { manager->stopAppAudioCapture(); });
    stop.awaitBlocked();
    release.set_value();
    stop.join();
    settle();
    EXPECT_EQ(tapStarts, 0);
    EXPECT_EQ(tap(), nullptr);
}

TEST_F(KVCaptureManagerAppAudioTest, DidStartHandlerMayStopEverything) {
    manager->startAppAudioCaptureForProcessID(kProcess, collect(appAudio),
                                              [this] { manager->stopAllCapture(); });
    settle();
    settle();
    EXPECT_EQ(tap(), nullptr);
}

TEST_F(KVCaptureManagerAppAudioTest, SamplesHoldTheToneAtTheTimeItWasPlayed) {
    const SimulatedTone tone{1000, 0.25};
    device.audio->setTone(kProcess, tone);
    startTapWithinARecording();
    device.advance(1s);
    hear(50ms);
    const auto samples = appAudio.copy();
    ASSERT_EQ(samples.size(), 1U);
    EXPECT_EQ(samples[0]->presentationTime(), MediaTime::make(1000000000, 1000000000));
    EXPECT_EQ(samples[0]->sampleCount(), 2205);
    EXPECT_EQ(samples[0]->duration(), MediaTime::make(2205, 44100));
    EXPECT_EQ(samples[0]->audioFormat(), manager->audioBasicDescription());
    const auto bytes = samples[0]->audioBytes();
    for (std::size_t i = 0; i < 2205; i += 35) {
        const auto value = static_cast<std::int16_t>(std::to_integer<int>(bytes[2 * i]) << 8 |
                                                     std::to_integer<int>(bytes[2 * i + 1]));
        EXPECT_NEAR(value, 32767 * tone.at(1 + static_cast<double>(i) / 44100), 1);
    }
}

TEST_F(KVCaptureManagerAppAudioTest, BuffersReturnToTheQueue) {
    startTapWithinARecording();
    for (int i = 0; i < 25; ++i)
        hear(50ms);
    EXPECT_EQ(appAudio.copy().size(), 25U);
    EXPECT_EQ(queue()->enqueuedCount(), 10U);
    EXPECT_EQ(tap()->currentPacket, 25 * 2205);
    EXPECT_EQ(log.count("KVRecordingManager: HandleInputBuffer: Successfully enqueued the audio buffer"),
              25U);
    EXPECT_EQ(manager->lastAudioDate(), device.clock->now() + 50ms);
}

TEST_F(KVCaptureManagerAppAudioTest, BufferThatCannotBeEnqueuedAgainIsNotMentioned) {
    startTapWithinARecording();
    device.failNext("AudioInputQueue.enqueueBuffer", EIO);
    hear(50ms);
    EXPECT_EQ(appAudio.copy().size(), 1U);
    EXPECT_EQ(queue()->enqueuedCount(), 9U);
    EXPECT_EQ(log.texts(), startTexts);
}

TEST_F(KVCaptureManagerAppAudioTest, CountlessBufferAdvancesByItsBytesAndYieldsASampleOfNone) {
    startTapWithinARecording();
    queue()->fillNextBuffer(Bytes(4096), 0ns, 0);
    settle();
    EXPECT_EQ(tap()->currentPacket, 2048);
    const auto samples = appAudio.copy();
    ASSERT_EQ(samples.size(), 1U);
    EXPECT_EQ(samples[0]->sampleCount(), 0);
    EXPECT_EQ(samples[0]->audioBytes().size(), 4096U);
    EXPECT_TRUE(samples[0]->duration().isZero());
}

TEST_F(KVCaptureManagerAppAudioTest, BuffersOutsideOfARecordingLeaveTheQueue) {
    startTap();
    for (int i = 0; i < 10; ++i)
        hear(50ms);
    EXPECT_EQ(queue()->enqueuedCount(), 0U);
    manager->setCaptureStartTime(MediaTime::make(0, 1));
    hear(50ms);
    EXPECT_TRUE(appAudio.copy().empty());
    manager->stopAppAudioCapture();
    startTap();
    hear(50ms);
    EXPECT_EQ(appAudio.copy().size(), 1U) << "a restart brings the sound back";
}

TEST_F(KVCaptureManagerAppAudioTest, ResumeFillsTheGapAtTimeZero) {
    startTapWithinARecording();
    hear(50ms);
    manager->stopAppAudioCapture();
    device.advance(2s);
    resumeTap();
    EXPECT_EQ(tapStarts, 1);
    hear(50ms);
    hear(50ms);
    const auto samples = appAudio.copy();
    ASSERT_EQ(samples.size(), 4U);
    // The last sample's end was taken to be 50 ms after it had come.
    EXPECT_EQ(samples[1]->sampleCount(), 88200);
    EXPECT_EQ(samples[1]->presentationTime(), MediaTime::zero());
    EXPECT_EQ(samples[1]->duration(), MediaTime::make(88200, 44100));
    EXPECT_EQ(samples[2]->sampleCount(), 2205);
    EXPECT_EQ(log.count("gap since last audio tap, filling with empty sample buffer"), 1U);
}

TEST_F(KVCaptureManagerAppAudioTest, ResumeWithoutAnEarlierSampleFillsNothing) {
    manager->setCaptureStartTime(MediaTime::make(0, 1));
    resumeTap();
    hear(50ms);
    EXPECT_EQ(appAudio.copy().size(), 1U);
    EXPECT_FALSE(log.contains("gap since last audio tap, filling with empty sample buffer"));
}

TEST_F(KVCaptureManagerAppAudioTest, OrdinaryStartFillsNoGap) {
    startTapWithinARecording();
    hear(50ms);
    manager->stopAppAudioCapture();
    device.advance(2s);
    startTap();
    hear(50ms);
    EXPECT_EQ(appAudio.copy().size(), 2U);
}

TEST_F(KVCaptureManagerAppAudioTest, BuffersAfterAStopWithinTheGapAreIgnored) {
    startTapWithinARecording();
    hear(50ms);
    manager->stopAppAudioCapture();
    device.advance(2s);
    manager->resumeAppAudioCaptureForProcessID(kProcess, [this](const SampleBufferRef& sample) {
        appAudio.with([&](auto& all) { all.push_back(sample); });
        manager->stopAppAudioCapture();
    });
    settle();
    hear(50ms);
    EXPECT_EQ(appAudio.copy().size(), 2U);
    EXPECT_EQ(log.count("recorder is not running, ignoring audio data"), 1U);
}

TEST_F(KVCaptureManagerAppAudioTest, StopReleasesEverythingAndLogsIt) {
    startTap();
    const auto stopped = queue();
    log.clear();
    manager->stopAppAudioCapture();
    std::vector<std::string> expected{
        "KVRecordingManager:stopAudioCapture: Audio Queue successfully stopped"};
    expected.insert(expected.end(), 10, "KVRecordingManager: Audio Queue buffer released");
    expected.emplace_back("KVRecordingManager: Audio Queue has been disposed");
    EXPECT_EQ(log.texts(), expected);
    EXPECT_TRUE(stopped->isDisposed());
    EXPECT_EQ(tap(), nullptr);
}

TEST_F(KVCaptureManagerAppAudioTest, StopWithoutATapDoesNothing) {
    manager->stopAppAudioCapture();
    EXPECT_TRUE(log.lines().empty());
}

TEST_F(KVCaptureManagerAppAudioTest, FailedStopKeepsTheQueueAndForgetsTheTap) {
    startTap();
    log.clear();
    device.failNext("AudioInputQueue.stop", EIO);
    const auto kept = queue();
    manager->stopAppAudioCapture();
    EXPECT_THAT(log.texts(), ElementsAre("KVRecordingManager:stopAudioCapture:error: 5"));
    EXPECT_FALSE(kept->isDisposed());
    EXPECT_EQ(tap(), nullptr);
}

TEST_F(KVCaptureManagerAppAudioTest, FailedReleasesAreLoggedOneByOne) {
    startTap();
    log.clear();
    device.failNext("AudioInputQueue.freeBuffer", EIO);
    device.failNext("AudioInputQueue.dispose", EBUSY);
    manager->stopAppAudioCapture();
    EXPECT_EQ(log.count("KVRecordingManager: error: 5"), 1U);
    EXPECT_EQ(log.count("KVRecordingManager: Audio Queue buffer released"), 9U);
    EXPECT_EQ(log.count("KVRecordingManager: error: 16"), 1U);
    EXPECT_FALSE(log.contains("KVRecordingManager: Audio Queue has been disposed"));
}

TEST_F(KVCaptureManagerAppAudioTest, BufferInFlightDuringAStopIsDropped) {
    startTapWithinARecording();
    device.advance(50ms);
    std::promise<void> release;
    KVCaptureManager::audioDispatchQueue().async([wait = release.get_future().share()] { wait.wait(); });
    test::BlockingCaller stop([this] { manager->stopAppAudioCapture(); });
    stop.awaitBlocked();
    device.audio->play(50ms);  // its task stands behind the stop
    release.set_value();
    stop.join();
    settle();
    EXPECT_TRUE(appAudio.copy().empty());
}

TEST_F(KVCaptureManagerAppAudioTest, AnotherStartTakesTheTapsPlace) {
    startTapWithinARecording();
    const std::weak_ptr<SimulatedInputQueue> first = queue();
    manager->startAppAudioCaptureForProcessID(7, collect(appAudio), countInto(tapStarts));
    settle();
    settle();
    EXPECT_TRUE(first.expired()) << "nobody could stop it any more";
    EXPECT_EQ(queue()->process(), 7);
    hear(50ms);
    EXPECT_EQ(appAudio.copy().size(), 1U);
    EXPECT_EQ(tapStarts, 2);
}

TEST_F(KVCaptureManagerAppAudioTest, StopAllStopsTheTapAndForgetsItsHandler) {
    startTapWithinARecording();
    hear(50ms);
    manager->stopAllCapture();
    EXPECT_EQ(tap(), nullptr);
    EXPECT_EQ(manager->lastAudioDate(), std::nullopt);
    EXPECT_FALSE(manager->captureStartTime().isValid());
}

/// Starts and stops from several threads while sound comes in all the time.
TEST_F(KVCaptureManagerAppAudioTest, StartsAndStopsAreSafeWhileSoundComesIn) {
    std::atomic<bool> isOver{false};
    std::thread sound([&] {
        while (!isOver) {
            device.clock->advance(1ms);
            device.audio->play(1ms);
            device.audio->interrupt();
        }
    });
    std::atomic<bool> mayBeCalled{false};
    std::atomic<int> lateCalls{0};
    const auto output = [&](const SampleBufferRef&) {
        if (!mayBeCalled) ++lateCalls;
    };
    for (int i = 0; i < 250; ++i) {
        mayBeCalled = true;
        manager->setCaptureStartTime(MediaTime::make(0, 1));
        manager->startMicrophoneCaptureWithOutput(output, nullptr);
        manager->resumeAppAudioCaptureForProcessID(kProcess, output);
        if (i % 2 == 0) settle();
        if (i % 5 == 0) manager->stopAppAudioCapture();
        manager->stopAllCapture();
        mayBeCalled = false;
    }
    isOver = true;
    sound.join();
    EXPECT_EQ(lateCalls, 0);
}

}  // namespace
}  // namespace kelvo
