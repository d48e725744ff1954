#include "CaptureManagerFixture.h"

#include <algorithm>

namespace kelvo {
namespace {

using namespace std::chrono_literals;
using testing::Contains;
using testing::ElementsAre;

/// What happens to the microphone when the system takes it away for a while.
class KVCaptureManagerInterruptionTest : public test::CaptureManagerFixture {};

TEST_F(KVCaptureManagerInterruptionTest, InterruptionIsFilledWithSilenceOfItsLength) {
    startMicrophone();
    hear(100ms);
    const MediaTime expected = manager->micInterruptionPresentationTimeStamp();
    device.takeMicrophone();
    EXPECT_TRUE(manager->isMicInterrupted());
    device.advance(500ms);
    device.giveMicrophoneBack();
    hear(100ms);  // half a second after the end of the last sample, which was 100 ms ahead of its arrival
    const auto samples = microphone.copy();
    ASSERT_EQ(samples.size(), 3U);
    EXPECT_EQ(samples[1]->sampleCount(), 22050);
    EXPECT_EQ(samples[1]->audioBytes().size(), 44100U);
    EXPECT_EQ(samples[1]->presentationTime(), expected);
    EXPECT_EQ(samples[1]->duration(), MediaTime::make(22050, 44100));
    EXPECT_FALSE(samples[1]->decodeTime().isValid());
    EXPECT_EQ(samples[1]->audioFormat(), manager->audioBasicDescription());
    EXPECT_TRUE(std::ranges::all_of(samples[1]->audioBytes(), [](std::byte b) { return b == std::byte{0}; }));
    EXPECT_EQ(samples[2]->sampleCount(), 4410);
    EXPECT_FALSE(manager->isMicInterrupted());
    EXPECT_THAT(log.texts(), Contains("KVCaptureManager: MXAudioSessionInterruptionTypeBegan"));
    EXPECT_THAT(log.texts(), Contains("KVCaptureManager: MXAudioSessionInterruptionTypeEnded"));
    EXPECT_EQ(log.count("gap since last mic tap, filling with empty sample buffer"), 1U);
}

TEST_F(KVCaptureManagerInterruptionTest, InterruptionBeforeTheFirstSampleOnlyClears) {
    startMicrophone();
    device.takeMicrophone();
    hear(100ms);
    EXPECT_EQ(microphone.copy().size(), 1U);
    EXPECT_FALSE(manager->isMicInterrupted());
    EXPECT_FALSE(log.contains("gap since last mic tap, filling with empty sample buffer"));
}

TEST_F(KVCaptureManagerInterruptionTest, SampleThatComesBeforeItsTimeFillsNothing) {
    startMicrophone();
    hear(100ms);
    device.takeMicrophone();
    hear(100ms);  // exactly when it was expected
    EXPECT_EQ(microphone.copy().size(), 2U);
    EXPECT_FALSE(manager->isMicInterrupted());
}

TEST_F(KVCaptureManagerInterruptionTest, GapThatTheClockMadeUpIsNotFilled) {
    startMicrophone();
    hear(100ms);
    device.takeMicrophone();
    device.advance(24h);
    hear(100ms);
    EXPECT_EQ(microphone.copy().size(), 2U);
}

TEST_F(KVCaptureManagerInterruptionTest, EndOfAnInterruptionAndOtherTypesDoNotInterrupt) {
    manager->handleAudioSessionInterruption(kAudioInterruptionEnded);
    manager->handleAudioSessionInterruption(2);
    EXPECT_FALSE(manager->isMicInterrupted());
    EXPECT_THAT(log.texts(), ElementsAre("KVCaptureManager: MXAudioSessionInterruptionTypeEnded"));
}

TEST_F(KVCaptureManagerInterruptionTest, InterruptionIsHeardByTheManagerThatCameLast) {
    startMicrophone();
    manager->stopAllCapture();
    const std::weak_ptr<KVCaptureManager> old = manager;
    manager = KVCaptureManager::create(device.platform());
    EXPECT_TRUE(old.expired());
    device.takeMicrophone();
    EXPECT_TRUE(manager->isMicInterrupted());
}

}  // namespace
}  // namespace kelvo
