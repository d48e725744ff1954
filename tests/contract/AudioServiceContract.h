#pragma once

#include "base/Guarded.h"
#include "platform/AudioService.h"

#include <memory>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {

/// What every audio service does, with or without something that sounds. `World` supplies one:
///
///     struct World {
///         AudioService& audio();
///         void listen();   // lets at least a quarter of a second of sound or silence pass through what runs
///         void settle();   // everything that was reported so far has arrived
///     };
template <typename World>
class AudioServiceContract : public testing::Test {
  protected:
    struct Filled {
        AudioQueueBufferRef buffer;
        AudioTimeStamp start;
        std::uint32_t packetCount = 0;
    };
    using FilledBuffers = Guarded<std::vector<Filled>>;

    static AudioFormatRecord format() {
        AudioFormatRecord result = AudioFormatRecord::signed16(44100, 1);
        result.formatFlags |= kAudioFlagBigEndian;
        return result;
    }
    AudioInputCallback collector() {
        return [filled = filled](const AudioQueueBufferRef& buffer, const AudioTimeStamp& start,
                                 std::uint32_t packetCount, auto) {
            filled->with([&](auto& all) { all.push_back({buffer, start, packetCount}); });
        };
    }
    AudioInputQueueRef makeQueue() {
        return *world.audio().createInputQueue(format(), collector(), kAudioQueueTapsProcess);
    }
    /// A queue with ten buffers, ready to start.
    AudioInputQueueRef makeReadyQueue() {
        auto queue = makeQueue();
        EXPECT_FALSE(queue->setTapProcess(kProcess));
        for (int i = 0; i < 10; ++i)
            EXPECT_FALSE(queue->enqueueBuffer(*queue->allocateBuffer(57344)));
        return queue;
    }

    static constexpr std::int32_t kProcess = 5000001;
    World world;
    std::shared_ptr<FilledBuffers> filled = std::make_shared<FilledBuffers>();
};

/// Counts what it is told.
class RunningObserver : public CaptureSessionObserver {
  public:
    void observeValueForKeyPath(std::string_view keyPath, CaptureSession&) override {
        keyPaths.with([&](auto& all) { all.emplace_back(keyPath); });
    }
    Guarded<std::vector<std::string>> keyPaths;
};

TYPED_TEST_SUITE_P(AudioServiceContract);

TYPED_TEST_P(AudioServiceContract, BuffersFollowOneAnotherInTheirOrder) {
    const auto queue = this->makeReadyQueue();
    ASSERT_FALSE(queue->start());
    this->world.listen();
    ASSERT_FALSE(queue->stop());
    const auto all = this->filled->copy();
    ASSERT_GE(all.size(), 2U);
    double frames = 0;
    for (const auto& each : all) {
        EXPECT_EQ(each.start.flags, kAudioSampleTimeValid | kAudioHostTimeValid);
        EXPECT_EQ(each.start.sampleTime, frames);
        EXPECT_NEAR(static_cast<double>(each.start.hostTime - all.front().start.hostTime),
                    frames * 1e9 / 44100, 10);
        EXPECT_EQ(each.buffer->byteSize, each.packetCount * 2U);
        EXPECT_GT(each.packetCount, 0U);
        frames += each.packetCount;
    }
}

TYPED_TEST_P(AudioServiceContract, BufferIsTheUsersUntilItIsEnqueuedAgain) {
    const auto queue = this->makeQueue();
    ASSERT_FALSE(queue->setTapProcess(this->kProcess));
    const auto buffer = *queue->allocateBuffer(4096);
    EXPECT_EQ(buffer->bytes.size(), 4096U);
    ASSERT_FALSE(queue->enqueueBuffer(buffer));
    ASSERT_FALSE(queue->start());
    this->world.listen();
    EXPECT_EQ(this->filled->copy().size(), 1U);
    EXPECT_FALSE(queue->enqueueBuffer(buffer));
    this->world.listen();
    ASSERT_FALSE(queue->stop());
    ASSERT_EQ(this->filled->copy().size(), 2U);
    EXPECT_EQ(this->filled->copy()[1].buffer, buffer);
}

TYPED_TEST_P(AudioServiceContract, NoCallbackComesAfterAStop) {
    const auto queue = this->makeReadyQueue();
    ASSERT_FALSE(queue->start());
    this->world.listen();
    ASSERT_FALSE(queue->stop());
    const auto count = this->filled->copy().size();
    this->world.listen();
    EXPECT_EQ(this->filled->copy().size(), count);
}

TYPED_TEST_P(AudioServiceContract, StrangeBuffersAreRefused) {
    const auto queue = this->makeQueue();
    const auto strange = std::make_shared<AudioQueueBuffer>();
    EXPECT_EQ(queue->enqueueBuffer(strange)->code(), kAudioInvalidBuffer);
    EXPECT_EQ(queue->enqueueBuffer(nullptr)->code(), kAudioInvalidBuffer);
    EXPECT_EQ(queue->freeBuffer(strange)->code(), kAudioInvalidBuffer);
    EXPECT_EQ(queue->enqueueBuffer(strange)->domain(), kAudioErrorDomain);
}

TYPED_TEST_P(AudioServiceContract, BufferIsEnqueuedOnceAndFreedOnce) {
    const auto queue = this->makeQueue();
    const auto buffer = *queue->allocateBuffer(4096);
    EXPECT_FALSE(queue->enqueueBuffer(buffer));
    EXPECT_EQ(queue->enqueueBuffer(buffer)->code(), kAudioInvalidBuffer);
    EXPECT_FALSE(queue->freeBuffer(buffer));
    EXPECT_EQ(queue->freeBuffer(buffer)->code(), kAudioInvalidBuffer);
    EXPECT_EQ(queue->enqueueBuffer(buffer)->code(), kAudioInvalidBuffer);
}

TYPED_TEST_P(AudioServiceContract, BuffersOfNoOrOfEndlessSizeAreRefused) {
    const auto queue = this->makeQueue();
    EXPECT_EQ(queue->allocateBuffer(0).error().code(), kAudioInvalidParameter);
    EXPECT_EQ(queue->allocateBuffer(0xFFFFFFFF).error().code(), kAudioInvalidParameter);
}

TYPED_TEST_P(AudioServiceContract, QueueNeedsAProcessToStart) {
    const auto queue = this->makeQueue();
    EXPECT_EQ(queue->setTapProcess(0)->code(), kAudioInvalidParameter);
    EXPECT_EQ(queue->setTapProcess(-1)->code(), kAudioInvalidParameter);
    EXPECT_EQ(queue->start()->code(), kAudioInvalidRunState);
}

TYPED_TEST_P(AudioServiceContract, RunningQueueKeepsItsProcessAndStartsOnce) {
    const auto queue = this->makeReadyQueue();
    ASSERT_FALSE(queue->start());
    EXPECT_EQ(queue->start()->code(), kAudioInvalidRunState);
    EXPECT_EQ(queue->setTapProcess(7)->code(), kAudioInvalidRunState);
    EXPECT_FALSE(queue->stop());
    EXPECT_FALSE(queue->stop()) << "a second stop changes nothing";
}

TYPED_TEST_P(AudioServiceContract, ListenerHearsOfStartAndStopUntilItIsTakenAway) {
    const auto queue = this->makeReadyQueue();
    const auto changes = std::make_shared<Guarded<int>>();
    const auto listener = [changes] { changes->with([](int& count) { ++count; }); };
    EXPECT_TRUE(queue->removeRunningListener()) << "there is none";
    ASSERT_FALSE(queue->addRunningListener(listener));
    ASSERT_FALSE(queue->start());
    this->world.settle();
    EXPECT_EQ(changes->copy(), 1);
    ASSERT_FALSE(queue->stop());
    this->world.settle();
    EXPECT_EQ(changes->copy(), 2);
    EXPECT_FALSE(queue->removeRunningListener());
    ASSERT_FALSE(queue->start());
    ASSERT_FALSE(queue->stop());
    this->world.settle();
    EXPECT_EQ(changes->copy(), 2);
}

TYPED_TEST_P(AudioServiceContract, DisposedQueueDoesNothingMore) {
    const auto queue = this->makeReadyQueue();
    ASSERT_FALSE(queue->start());
    EXPECT_FALSE(queue->dispose());
    const auto count = this->filled->copy().size();
    this->world.listen();
    EXPECT_EQ(this->filled->copy().size(), count);
    EXPECT_EQ(queue->setTapProcess(7)->code(), kAudioInvalidRunState);
    EXPECT_EQ(queue->streamFormat().error().code(), kAudioInvalidRunState);
    EXPECT_EQ(queue->maximumOutputPacketSize().error().code(), kAudioInvalidRunState);
    EXPECT_EQ(queue->allocateBuffer(4096).error().code(), kAudioInvalidRunState);
    EXPECT_EQ(queue->enqueueBuffer(nullptr)->code(), kAudioInvalidRunState);
    EXPECT_EQ(queue->freeBuffer(nullptr)->code(), kAudioInvalidRunState);
    EXPECT_EQ(queue->start()->code(), kAudioInvalidRunState);
    EXPECT_EQ(queue->stop()->code(), kAudioInvalidRunState);
    EXPECT_EQ(queue->dispose()->code(), kAudioInvalidRunState);
    EXPECT_EQ(queue->addRunningListener([] {})->code(), kAudioInvalidRunState);
    EXPECT_EQ(queue->removeRunningListener()->code(), kAudioInvalidRunState);
}

TYPED_TEST_P(AudioServiceContract, QueueYieldsTheFormatThatWasAskedFor) {
    const auto queue = this->makeQueue();
    EXPECT_EQ(*queue->streamFormat(), this->format());
    EXPECT_EQ(*queue->maximumOutputPacketSize(), 2U);
}

TYPED_TEST_P(AudioServiceContract, OtherFormatsAndPurposesAreRefused) {
    const auto create = [this](const AudioFormatRecord& format, std::uint32_t flags) {
        return this->world.audio().createInputQueue(format, this->collector(), flags);
    };
    const auto stereo = AudioFormatRecord::signed16(48000, 2);
    EXPECT_TRUE(create(stereo, kAudioQueueTapsProcess));
    EXPECT_EQ(create(stereo, 0).error().code(), kAudioInvalidParameter);
    const auto six = AudioFormatRecord::signed16(48000, 6);
    EXPECT_EQ(create(six, kAudioQueueTapsProcess).error().code(), kAudioFormatNotSupported);
    const auto floats = AudioFormatRecord::float32(48000, 1);
    EXPECT_EQ(create(floats, kAudioQueueTapsProcess).error().code(), kAudioFormatNotSupported);
    EXPECT_EQ(create({}, kAudioQueueTapsProcess).error().code(), kAudioFormatNotSupported);
    const auto callless =
        this->world.audio().createInputQueue(this->format(), nullptr, kAudioQueueTapsProcess);
    EXPECT_EQ(callless.error().code(), kAudioInvalidParameter);
}

TYPED_TEST_P(AudioServiceContract, SessionTakesEachPartOnce) {
    AudioService& audio = this->world.audio();
    const auto session = audio.createCaptureSession();
    const auto input = *audio.createInput(audio.defaultAudioDevice());
    const auto output = audio.createAudioDataOutput();
    EXPECT_FALSE(session->canAddInput(nullptr));
    EXPECT_FALSE(session->canAddOutput(nullptr));
    EXPECT_TRUE(session->canAddInput(input));
    EXPECT_TRUE(session->canAddOutput(output));
    session->addInput(input);
    session->addOutput(output);
    EXPECT_FALSE(session->canAddInput(input));
    EXPECT_FALSE(session->canAddOutput(output));
    session->removeInput(input);
    session->removeOutput(output);
    session->removeOutput(output);
    EXPECT_TRUE(session->canAddInput(input));
    EXPECT_TRUE(session->canAddOutput(output));
}

TYPED_TEST_P(AudioServiceContract, SessionTellsItsObserversThatItRuns) {
    const auto session = this->world.audio().createCaptureSession();
    const auto observer = std::make_shared<RunningObserver>();
    session->addObserver(observer, kRunningKeyPath);
    EXPECT_FALSE(session->isRunning());
    session->startRunning();
    session->startRunning();
    this->world.settle();
    EXPECT_TRUE(session->isRunning());
    EXPECT_EQ(observer->keyPaths.copy(), std::vector<std::string>{"running"});
    EXPECT_FALSE(session->removeObserver(observer.get(), kRunningKeyPath));
    session->stopRunning();
    session->stopRunning();
    this->world.settle();
    EXPECT_FALSE(session->isRunning());
    EXPECT_EQ(observer->keyPaths.copy().size(), 1U);
}

TYPED_TEST_P(AudioServiceContract, RemovalOfAnObserverThatDoesNotObserveFails) {
    const auto session = this->world.audio().createCaptureSession();
    const auto observer = std::make_shared<RunningObserver>();
    EXPECT_TRUE(session->removeObserver(observer.get(), kRunningKeyPath));
    session->addObserver(observer, kRunningKeyPath);
    EXPECT_TRUE(session->removeObserver(observer.get(), "interrupted"));
    EXPECT_FALSE(session->removeObserver(observer.get(), kRunningKeyPath));
    EXPECT_TRUE(session->removeObserver(observer.get(), kRunningKeyPath));
}

TYPED_TEST_P(AudioServiceContract, InputNeedsADevice) {
    EXPECT_FALSE(this->world.audio().createInput(nullptr));
    EXPECT_FALSE(this->world.audio().defaultAudioDevice()->name().empty());
}

TYPED_TEST_P(AudioServiceContract, AudioSessionIsOne) {
    EXPECT_EQ(this->world.audio().audioSession(), this->world.audio().audioSession());
    EXPECT_FALSE(this->world.audio().audioSession()->setCategory(AudioSessionCategory::playAndRecord,
                                                                 kAudioMixWithOthers));
}

REGISTER_TYPED_TEST_SUITE_P(AudioServiceContract, BuffersFollowOneAnotherInTheirOrder,
                            BufferIsTheUsersUntilItIsEnqueuedAgain, NoCallbackComesAfterAStop,
                            StrangeBuffersAreRefused, BufferIsEnqueuedOnceAndFreedOnce,
                            BuffersOfNoOrOfEndlessSizeAreRefused, QueueNeedsAProcessToStart,
                            RunningQueueKeepsItsProcessAndStartsOnce,
                            ListenerHearsOfStartAndStopUntilItIsTakenAway, DisposedQueueDoesNothingMore,
                            QueueYieldsTheFormatThatWasAskedFor, OtherFormatsAndPurposesAreRefused,
                            SessionTakesEachPartOnce, SessionTellsItsObserversThatItRuns,
                            RemovalOfAnObserverThatDoesNotObserveFails, InputNeedsADevice, AudioSessionIsOne);

}  // namespace kelvo::test
