#include "CaptureManagerFixture.h"
#include "support/Threads.h"

#include <cerrno>
#include <cstring>
#include <future>

namespace kelvo {
namespace {

using namespace std::chrono_literals;
using testing::ElementsAre;

class KVCaptureManagerMicrophoneTest : public test::CaptureManagerFixture {};

TEST_F(KVCaptureManagerMicrophoneTest, CreationAsksForPlayAndRecordBesideOthers) {
    const auto category = device.audio->session->category();
    EXPECT_EQ(category.category, AudioSessionCategory::playAndRecord);
    EXPECT_EQ(category.options, 0x5U);
}

TEST_F(KVCaptureManagerMicrophoneTest, RefusedCategoryIsIgnored) {
    device.failNext("AudioSession.setCategory", EPERM);
    manager = KVCaptureManager::create(device.platform());
    startMicrophone();
    EXPECT_EQ(micStarts, 1);
}

TEST_F(KVCaptureManagerMicrophoneTest, InitialValuesAreThoseOfAnIdleManager) {
    EXPECT_EQ(manager->captureSession(), nullptr);
    EXPECT_EQ(manager->captureDeviceAudioInput(), nullptr);
    EXPECT_EQ(manager->captureDeviceVideoInput(), nullptr);
    EXPECT_EQ(manager->captureSessionAudioDataOutput(), nullptr);
    EXPECT_EQ(manager->captureSessionVideoDataOutput(), nullptr);
    EXPECT_EQ(manager->avPreviewLayer(), nullptr);
    EXPECT_EQ(manager->cameraPosition(), 0);
    EXPECT_FALSE(manager->isRecordingMicrophone());
    EXPECT_FALSE(manager->isRecordingCamera());
    EXPECT_FALSE(manager->isRecordingAppAudio());
    EXPECT_FALSE(manager->isSessionInProgress());
    EXPECT_FALSE(manager->captureStartTime().isValid());
    EXPECT_FALSE(manager->isMicInterrupted());
    EXPECT_EQ(manager->micInterruptionPresentationTimeStamp(), MediaTime::zero());
    EXPECT_EQ(manager->lastMicAudioDate(), std::nullopt);
    EXPECT_EQ(manager->lastAudioDate(), std::nullopt);
    EXPECT_EQ(manager->sessionSampleBufferQueue()->label(), "com.quillon.kelvokit.capture.session");
    EXPECT_EQ(KVCaptureManager::audioDispatchQueue().label(), "com.quillon.KelvoKit.CaptureQueue");
    EXPECT_EQ(manager->initialTimestamp(), AudioTimeStamp());
    EXPECT_EQ(manager->initialTimestamp().rateScalar, 1.0);
}

TEST_F(KVCaptureManagerMicrophoneTest, BasicDescriptionIsBigEndianMonoOf44100Hz) {
    EXPECT_EQ(manager->audioBasicDescription(),
              (AudioFormatRecord{44100.0, 0x6C70636D, 14, 2, 1, 2, 1, 16, 0}));
}

TEST_F(KVCaptureManagerMicrophoneTest, SharedManagerIsOne) {
    const auto first = KVCaptureManager::sharedManager(device.platform());
    EXPECT_EQ(first, KVCaptureManager::sharedManager(device.platform()));
    EXPECT_FALSE(first->captureStartTime().isValid());
}

TEST_F(KVCaptureManagerMicrophoneTest, ThereIsAlwaysACaptureDevice) {
    EXPECT_TRUE(manager->hasAudioCaptureDevice());
}

TEST_F(KVCaptureManagerMicrophoneTest, StartSetsUpTheSessionAndCallsBackOnce) {
    startMicrophone();
    EXPECT_EQ(micStarts, 1);
    EXPECT_TRUE(manager->isRecordingMicrophone());
    EXPECT_TRUE(manager->isSessionInProgress());
    const auto session = device.audio->captureSession();
    EXPECT_EQ(manager->captureSession(), session);
    EXPECT_TRUE(session->isRunning());
    EXPECT_TRUE(session->usesApplicationSession());
    EXPECT_FALSE(session->configuresApplicationSession());
    EXPECT_EQ(session->inputCount(), 1U);
    EXPECT_EQ(session->outputCount(), 1U);
    EXPECT_EQ(session->observerCount(), 0U) << "the observation ends with the start";
    EXPECT_THAT(log.texts(), ElementsAre("KVCaptureManager: setAudioCaptureEnabled: YES",
                                         "KVCaptureManager: startCaptureSession"));
}

TEST_F(KVCaptureManagerMicrophoneTest, DidStartWaitsForALateSession) {
    device.audio->orders->runsLate = true;
    startMicrophone();
    EXPECT_EQ(micStarts, 0);
    device.audio->captureSession()->letRun();
    EXPECT_EQ(micStarts, 1);
}

TEST_F(KVCaptureManagerMicrophoneTest, OtherKeyPathsAreIgnored) {
    device.audio->orders->runsLate = true;
    startMicrophone();
    manager->observeValueForKeyPath("interrupted", *device.audio->captureSession());
    EXPECT_EQ(micStarts, 0);
    EXPECT_EQ(device.audio->captureSession()->observerCount(), 1U);
    device.audio->captureSession()->letRun();
    EXPECT_EQ(micStarts, 1);
}

TEST_F(KVCaptureManagerMicrophoneTest, ObservationWithoutAHandlerOrRegistrationIsHarmless) {
    manager->startMicrophoneCaptureWithOutput(collect(microphone), nullptr);
    settle();
    manager->observeValueForKeyPath(kRunningKeyPath, *device.audio->captureSession());
    hear(100ms);
    EXPECT_EQ(microphone.copy().size(), 1U);
}

TEST_F(KVCaptureManagerMicrophoneTest, SecondStartWhileRecordingChangesNothing) {
    startMicrophone();
    Samples other;
    std::atomic<int> otherStarts{0};
    manager->startMicrophoneCaptureWithOutput(collect(other), countInto(otherStarts));
    hear(100ms);
    EXPECT_EQ(otherStarts, 0);
    EXPECT_TRUE(other.copy().empty());
    EXPECT_EQ(microphone.copy().size(), 1U);
    EXPECT_EQ(device.audio->captureSessions().size(), 1U);
    EXPECT_EQ(log.count("KVCaptureManager: setAudioCaptureEnabled: YES"), 1U);
}

TEST_F(KVCaptureManagerMicrophoneTest, StartWhileTheSessionRunsCallsBackAtOnce) {
    startMicrophone();
    manager->stopMicrophoneCapture();
    EXPECT_TRUE(device.audio->captureSession()->isRunning());
    device.audio->orders->runsLate = true;  // nothing may depend on another start
    startMicrophone();
    EXPECT_EQ(micStarts, 2);
    EXPECT_EQ(device.audio->captureSession()->observerCount(), 0U);
    EXPECT_EQ(device.audio->captureSession()->inputCount(), 1U);
}

TEST_F(KVCaptureManagerMicrophoneTest, StartWithoutOutputKeepsTheOneBefore) {
    startMicrophone();
    manager->stopMicrophoneCapture();
    manager->startMicrophoneCaptureWithOutput(nullptr, nullptr);
    settle();
    hear(100ms);
    EXPECT_EQ(microphone.copy().size(), 1U);
}

TEST_F(KVCaptureManagerMicrophoneTest, SamplesHoldTheTone) {
    const SimulatedTone tone{440, 0.5};
    device.audio->setMicrophoneTone(tone);
    startMicrophone();
    hear(100ms);
    const auto samples = microphone.copy();
    ASSERT_EQ(samples.size(), 1U);
    EXPECT_EQ(samples[0]->sampleCount(), 4410);
    EXPECT_EQ(samples[0]->presentationTime(), MediaTime::make(0, 1000000000));
    std::vector<std::int16_t> content(4410);
    std::memcpy(content.data(), samples[0]->audioBytes().data(), samples[0]->audioBytes().size());
    for (int i = 0; i < 4410; i += 49)
        EXPECT_NEAR(content[static_cast<std::size_t>(i)], 32767 * tone.at(i / 44100.0), 1);
}

TEST_F(KVCaptureManagerMicrophoneTest, SampleMovesTheExpectedTimeAndDate) {
    startMicrophone();
    hear(100ms);
    EXPECT_EQ(manager->lastMicAudioDate(), device.clock->now() + 100ms);
    EXPECT_EQ(compare(manager->micInterruptionPresentationTimeStamp(), MediaTime::make(100, 1000)),
              std::partial_ordering::equivalent);
}

TEST_F(KVCaptureManagerMicrophoneTest, StopRemovesInputAndOutputAndLeavesTheSessionRunning) {
    startMicrophone();
    manager->stopMicrophoneCapture();
    EXPECT_FALSE(manager->isRecordingMicrophone());
    EXPECT_TRUE(manager->isSessionInProgress());
    EXPECT_TRUE(device.audio->captureSession()->isRunning());
    EXPECT_EQ(device.audio->captureSession()->inputCount(), 0U);
    EXPECT_EQ(device.audio->captureSession()->outputCount(), 0U);
    EXPECT_TRUE(log.contains("KVCaptureManager: setAudioCaptureEnabled: NO"));
}

TEST_F(KVCaptureManagerMicrophoneTest, StopWithoutAStartDoesNothing) {
    manager->stopMicrophoneCapture();
    EXPECT_TRUE(log.lines().empty());
}

TEST_F(KVCaptureManagerMicrophoneTest, StopWaitsForTheStartBeforeIt) {
    manager->startMicrophoneCaptureWithOutput(collect(microphone), countInto(micStarts));
    manager->stopMicrophoneCapture();
    EXPECT_EQ(micStarts, 1);
    EXPECT_FALSE(manager->isRecordingMicrophone());
    EXPECT_EQ(device.audio->captureSession()->inputCount(), 0U);
}

TEST_F(KVCaptureManagerMicrophoneTest, StopAllStopsTheSessionOfAStartBeforeIt) {
    manager->startMicrophoneCaptureWithOutput(collect(microphone), nullptr);
    manager->stopAllCapture();
    EXPECT_FALSE(device.audio->captureSession()->isRunning());
    EXPECT_FALSE(manager->isSessionInProgress());
    EXPECT_FALSE(manager->isRecordingMicrophone());
}

TEST_F(KVCaptureManagerMicrophoneTest, SampleThatWaitsDuringTheStopIsDropped) {
    startMicrophone();
    device.advance(100ms);
    std::promise<void> release;
    manager->sessionSampleBufferQueue()->async([wait = release.get_future().share()] { wait.wait(); });
    device.audio->play(100ms);
    test::BlockingCaller stop([this] { manager->stopMicrophoneCapture(); });
    stop.awaitBlocked();
    release.set_value();
    stop.join();
    EXPECT_TRUE(microphone.copy().empty());
}

TEST_F(KVCaptureManagerMicrophoneTest, StopWaitsForTheHandlerThatRuns) {
    std::promise<void> entered;
    std::promise<void> release;
    std::atomic<bool> hasEnded{false};
    manager->startMicrophoneCaptureWithOutput(
        [&](const SampleBufferRef&) {
            entered.set_value();
            release.get_future().wait();
            hasEnded = true;
        },
        nullptr);
    settle();
    device.advance(100ms);
    device.audio->play(100ms);
    entered.get_future().wait();
    bool hadEnded = false;
    test::BlockingCaller stop([&] {
        manager->stopMicrophoneCapture();
        hadEnded = hasEnded;
    });
    stop.awaitBlocked();
    release.set_value();
    stop.join();
    EXPECT_TRUE(hadEnded);
}

TEST_F(KVCaptureManagerMicrophoneTest, HandlerMayStopEverything) {
    manager->startMicrophoneCaptureWithOutput(
        [this](const SampleBufferRef& sample) {
            microphone.with([&](auto& all) { all.push_back(sample); });
            manager->stopAllCapture();
        },
        nullptr);
    settle();
    hear(100ms);
    hear(100ms);
    EXPECT_EQ(microphone.copy().size(), 1U);
    EXPECT_FALSE(manager->isRecordingMicrophone());
}

TEST_F(KVCaptureManagerMicrophoneTest, InputThatCannotBeMadeYieldsNoSamples) {
    device.failNext("AudioService.createInput", ENODEV);
    startMicrophone();
    hear(100ms);
    EXPECT_EQ(micStarts, 1);
    EXPECT_EQ(device.audio->captureSession()->inputCount(), 0U);
    EXPECT_TRUE(microphone.copy().empty());
    manager->stopMicrophoneCapture();
    EXPECT_FALSE(manager->isRecordingMicrophone());
}

TEST_F(KVCaptureManagerMicrophoneTest, InputThatCannotBeAddedYieldsNoSamples) {
    device.audio->orders->refusesInputs = true;
    startMicrophone();
    hear(100ms);
    EXPECT_EQ(micStarts, 1);
    EXPECT_NE(manager->captureDeviceAudioInput(), nullptr);
    EXPECT_TRUE(microphone.copy().empty());
}

TEST_F(KVCaptureManagerMicrophoneTest, OutputThatCannotBeAddedYieldsNoSamples) {
    device.audio->orders->refusesOutputs = true;
    startMicrophone();
    hear(100ms);
    EXPECT_EQ(micStarts, 1);
    EXPECT_TRUE(microphone.copy().empty());
}

TEST_F(KVCaptureManagerMicrophoneTest, SampleWithoutAHandlerIsDroppedUnrecorded) {
    manager->startMicrophoneCaptureWithOutput(nullptr, nullptr);
    settle();
    hear(100ms);
    EXPECT_EQ(manager->lastMicAudioDate(), std::nullopt);
}

TEST_F(KVCaptureManagerMicrophoneTest, CameraSamplesNeedAnOutputAndAHandler) {
    class Output : public CaptureOutput {};
    const auto output = std::make_shared<Output>();
    const auto sample = SampleBuffer::video(nullptr, {});
    Samples camera;
    manager->captureOutputDidOutputSampleBuffer(output, sample, {});
    manager->setCaptureSessionVideoDataOutput(output);
    manager->captureOutputDidOutputSampleBuffer(output, sample, {});
    EXPECT_TRUE(camera.copy().empty());
    manager->setCameraOutputHandler(collect(camera));
    manager->captureOutputDidOutputSampleBuffer(output, sample, {});
    manager->captureOutputDidOutputSampleBuffer(std::make_shared<Output>(), sample, {});
    EXPECT_EQ(camera.copy().size(), 1U);
    manager->stopAllCapture();
    manager->captureOutputDidOutputSampleBuffer(output, sample, {});
    EXPECT_EQ(camera.copy().size(), 1U) << "stopping everything forgets the handler";
}

TEST_F(KVCaptureManagerMicrophoneTest, SessionIsMadeOnceAndStoppedOnce) {
    manager->startCaptureSession();
    manager->startCaptureSession();
    EXPECT_EQ(device.audio->captureSessions().size(), 1U);
    const auto session = manager->captureSession();
    manager->stopCaptureSession();
    manager->stopCaptureSession();
    EXPECT_FALSE(manager->isSessionInProgress());
    EXPECT_EQ(manager->captureSession(), session) << "the object is kept";
    EXPECT_EQ(log.count("KVCaptureManager: startCaptureSession"), 2U);
    EXPECT_EQ(log.count("KVCaptureManager: stopDeviceCaptureSessionWithFinishHandler"), 2U);
    manager->startCaptureSession();
    EXPECT_NE(manager->captureSession(), session);
}

TEST_F(KVCaptureManagerMicrophoneTest, NewSessionEndsTheObservationOfTheOldOne) {
    device.audio->orders->runsLate = true;
    startMicrophone();
    const auto old = device.audio->captureSession();
    EXPECT_EQ(old->observerCount(), 1U);
    manager->setCaptureSession(old);
    EXPECT_EQ(old->observerCount(), 1U) << "the same session is no change";
    manager->setCaptureSession(device.audio->createCaptureSession());
    EXPECT_EQ(old->observerCount(), 0U);
}

TEST_F(KVCaptureManagerMicrophoneTest, StoppedSessionNeverCallsDidStart) {
    device.audio->orders->runsLate = true;
    startMicrophone();
    const auto session = device.audio->captureSession();
    manager->stopAllCapture();
    session->letRun();
    EXPECT_EQ(session->observerCount(), 0U);
    EXPECT_EQ(micStarts, 0);
}

TEST_F(KVCaptureManagerMicrophoneTest, StopAllForgetsHandlersAndTimes) {
    startMicrophone();
    manager->setCaptureStartTime(MediaTime::make(1, 1));
    hear(100ms);
    manager->stopAllCapture();
    EXPECT_FALSE(manager->captureStartTime().isValid());
    EXPECT_EQ(manager->lastMicAudioDate(), std::nullopt);
    EXPECT_EQ(manager->lastAudioDate(), std::nullopt);
    EXPECT_FALSE(device.audio->captureSession()->isRunning());
    manager->startMicrophoneCaptureWithOutput(nullptr, nullptr);
    settle();
    hear(100ms);
    EXPECT_EQ(microphone.copy().size(), 1U) << "the handler of before is gone";
}

TEST_F(KVCaptureManagerMicrophoneTest, SamplesAfterTheManagersEndAreDropped) {
    startMicrophone();
    const auto session = device.audio->captureSession();
    device.advance(100ms);
    const auto queue = manager->sessionSampleBufferQueue();
    manager->stopAllCapture();
    manager.reset();
    device.audio->play(100ms);
    queue->sync([] {});
    EXPECT_TRUE(microphone.copy().empty());
    manager = KVCaptureManager::create(device.platform());
}

}  // namespace
}  // namespace kelvo
