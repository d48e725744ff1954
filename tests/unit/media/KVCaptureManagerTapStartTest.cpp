#include "AppAudioFixture.h"

#include <cerrno>
#include <functional>

namespace kelvo {
namespace {

using namespace std::chrono_literals;

/// Audio whose input queues have another format than they were asked for.
class AudioOfAnotherFormat : public SimulatedAudio {
  public:
    using Change = std::function<void(AudioFormatRecord&)>;

    AudioOfAnotherFormat(const SimulatedDevice& device, Change change)
        : SimulatedAudio(device.clock, device.faults), change_(std::move(change)) {}

    Result<AudioInputQueueRef> createInputQueue(const AudioFormatRecord& format, AudioInputCallback call,
                                                std::uint32_t flags) override {
        auto made = SimulatedAudio::createInputQueue(format, std::move(call), flags);
        AudioFormatRecord reported = format;
        change_(reported);
        inputQueue()->setStreamFormat(reported);
        return made;
    }

  private:
    const Change change_;
};

class KVCaptureManagerTapStartTest : public test::AppAudioFixture {
  protected:
    /// Makes another manager, on audio whose format is changed like this.
    std::shared_ptr<SimulatedAudio> useAudio(AudioOfAnotherFormat::Change change) {
        Platform platform = device.platform();
        auto audio = std::make_shared<AudioOfAnotherFormat>(device, std::move(change));
        platform.audio = audio;
        manager = KVCaptureManager::create(platform);
        return audio;
    }
};

TEST_F(KVCaptureManagerTapStartTest, TapThatCannotBeMadeLogsEveryStepAndItsTexts) {
    device.failNext("AudioService.createInputQueue", EIO);
    startTap();
    EXPECT_EQ(device.audio->inputQueue(), nullptr);
    EXPECT_EQ(log.count(startError(5)), 1U);
    // The process, the format, ten buffers allocated and enqueued, the listener and the start.
    EXPECT_EQ(log.count(startError(kAudioInvalidParameter)), 24U);
    for (const std::string& text : startTexts)
        EXPECT_EQ(log.count(text), 1U);
    EXPECT_EQ(tapStarts, 0);
    manager->stopAppAudioCapture();
    EXPECT_TRUE(
        log.contains("KVRecordingManager:stopAudioCapture:error: " + std::to_string(kAudioInvalidParameter)));
    EXPECT_EQ(tap(), nullptr);
}

/// One failing step of a start.
struct FailingStep {
    const char* operation;
    int failures;  ///< how many lines it causes
};

class KVCaptureManagerFailingStartTest : public KVCaptureManagerTapStartTest,
                                         public testing::WithParamInterface<FailingStep> {};

TEST_P(KVCaptureManagerFailingStartTest, FailureIsLoggedAndTheStartGoesOn) {
    device.failNext(GetParam().operation, EIO);
    startTapWithinARecording();
    EXPECT_EQ(log.count(startError(5)), 1U);
    EXPECT_EQ(log.count(startError(kAudioInvalidBuffer)) + log.count(startError(kAudioInvalidRunState)),
              static_cast<std::size_t>(GetParam().failures - 1));
    for (const std::string& text : startTexts)
        EXPECT_EQ(log.count(text), 1U);
    EXPECT_EQ(tap()->format, manager->audioBasicDescription());
}

INSTANTIATE_TEST_SUITE_P(
    EachStep, KVCaptureManagerFailingStartTest,
    testing::Values(FailingStep{"AudioInputQueue.setTapProcess",
                                2},  // a queue without a process cannot start
                    FailingStep{"AudioInputQueue.streamFormat", 1},
                    FailingStep{"AudioInputQueue.allocateBuffer", 2},  // no buffer, nothing to enqueue
                    FailingStep{"AudioInputQueue.enqueueBuffer", 1},
                    FailingStep{"AudioInputQueue.addRunningListener", 1},
                    FailingStep{"AudioInputQueue.start", 1}),
    [](const auto& step) {
        return std::string(step.param.operation).substr(std::string("AudioInputQueue.").size());
    });

TEST_F(KVCaptureManagerTapStartTest, PacketSizeOfAFormatWithoutOneIsAskedOfTheQueue) {
    useAudio([](AudioFormatRecord& format) {
        format.bytesPerPacket = 0;
        format.sampleRate = 8000;
    });
    startTap();
    EXPECT_EQ(tap()->format.bytesPerPacket, 0U);
    EXPECT_EQ(tap()->bufferByteSize, 16000U);
    manager->stopAllCapture();
    device.failNext("AudioInputQueue.maximumOutputPacketSize", EIO);
    startTap();
    EXPECT_EQ(tap()->bufferByteSize, 0U);
    EXPECT_TRUE(log.contains(startError(5)));
    manager->stopAllCapture();
}

TEST_F(KVCaptureManagerTapStartTest, SampleOfAFormatThatMakesNoSenseIsSkippedAndItsBufferReturned) {
    startTapWithinARecording();
    manager->stopAppAudioCapture();
    const auto audio = useAudio([](AudioFormatRecord& format) { format.formatIdentifier = 0; });
    startTapWithinARecording();
    audio->inputQueue()->fillNextBuffer(Bytes(4096), 0ns, 2048);
    settle();
    EXPECT_TRUE(appAudio.copy().empty());
    EXPECT_EQ(manager->lastAudioDate(), std::nullopt);
    EXPECT_EQ(tap()->currentPacket, 2048);
    EXPECT_EQ(audio->inputQueue()->enqueuedCount(), 10U);
    manager->stopAllCapture();
}

}  // namespace
}  // namespace kelvo
