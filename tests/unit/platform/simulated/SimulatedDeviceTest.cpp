#include "base/GlobalQueue.h"
#include "platform/simulated/SimulatedDevice.h"

#include <cerrno>
#include <future>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using namespace std::chrono_literals;
using testing::ElementsAre;

class CallListener : public CallObserverDelegate {
  public:
    void callObserverCallChanged(CallObserver&, const Call& call) override {
        calls.push_back(std::string(call.isOutgoing ? "out" : "in") + (call.hasEnded ? " ended" : ""));
    }
    std::vector<std::string> calls;
};

class SimulatedDeviceTest : public testing::Test {
  protected:
    OptionalError perform(std::string_view line) { return device.perform(line); }
    std::uint64_t lockState() { return device.notifications->state(token); }

    SimulatedDevice device;
    std::atomic<int> lockEvents{0};
    NotificationToken token = device.notifications->registerForNotification(
        kBlankedScreenNotification, QueuePriority::normal, [this](NotificationToken) { ++lockEvents; });
};

TEST_F(SimulatedDeviceTest, PlatformHasEveryService) {
    const Platform platform = device.platform();
    EXPECT_TRUE(platform.clock && platform.random && platform.mainQueue && platform.fileSystem);
    EXPECT_TRUE(platform.textFolding && platform.bundles && platform.languages && platform.preferences);
    EXPECT_TRUE(platform.device && platform.notifications && platform.storagePurge && platform.calls);
    EXPECT_TRUE(platform.restrictions && platform.displayLayout && platform.bulletins && platform.alerts);
    EXPECT_TRUE(platform.ipc);
}

TEST_F(SimulatedDeviceTest, ClockStandsUntilItIsMoved) {
    const Date start = device.clock->now();
    EXPECT_EQ(start, Date::fromSecondsSince1970(1700000000));
    device.settle();
    EXPECT_EQ(device.clock->now(), start);
    device.advance(5s);
    EXPECT_EQ(device.clock->now() - start, 5s);
    EXPECT_EQ(device.clock->monotonicNow(), 5s);
}

TEST_F(SimulatedDeviceTest, AdvanceRunsTheTimersThatAreDue) {
    int runs = 0;
    const auto timer = device.mainQueue->scheduleRepeating(1s, [&] { ++runs; });
    device.advance(1s);
    EXPECT_EQ(runs, 1);
}

TEST_F(SimulatedDeviceTest, SettleFollowsWorkFromQueueToQueue) {
    bool hasArrived = false;
    device.mainQueue->async([&] {
        GlobalQueue::get(QueuePriority::low).async([&] {
            device.mainQueue->async(
                [&] { GlobalQueue::get(QueuePriority::high).async([&] { hasArrived = true; }); });
        });
    });
    device.settle();
    EXPECT_TRUE(hasArrived);
}

TEST_F(SimulatedDeviceTest, LockAndUnlockPostTheBlankedScreen) {
    device.lock();
    device.settle();
    EXPECT_EQ(lockState(), 1U);
    device.unlock();
    device.settle();
    EXPECT_EQ(lockState(), 0U);
    EXPECT_EQ(lockEvents, 2);
}

TEST_F(SimulatedDeviceTest, CallsReachTheDelegateOnTheMainQueue) {
    const auto listener = std::make_shared<CallListener>();
    device.calls->setDelegate(listener);
    device.ring();
    device.dial();
    device.hangUp();
    EXPECT_TRUE(listener->calls.empty());
    device.settle();
    EXPECT_THAT(listener->calls, ElementsAre("in", "out", "in ended"));
}

TEST_F(SimulatedDeviceTest, CallsWithoutADelegateAreHarmless) {
    device.calls->setDelegate(std::make_shared<CallListener>());  // gone at once
    device.ring();
    device.settle();
}

TEST_F(SimulatedDeviceTest, OrderedFailureHitsOneCallOfItsOperation) {
    device.failNext("FileSystem.freeSpace", EIO);
    EXPECT_TRUE(device.fileSystem->itemExists("/"));
    EXPECT_EQ(device.fileSystem->freeSpace("/").error().code(), EIO);
    EXPECT_TRUE(device.fileSystem->freeSpace("/"));
}

TEST_F(SimulatedDeviceTest, OrderedFailuresComeInTheirOrder) {
    device.failNext("FileSystem.freeSpace", EIO);
    device.failNext("FileSystem.freeSpace", EACCES);
    EXPECT_EQ(device.fileSystem->freeSpace("/").error().code(), EIO);
    EXPECT_EQ(device.fileSystem->freeSpace("/").error().code(), EACCES);
    EXPECT_TRUE(device.fileSystem->freeSpace("/"));
}

TEST_F(SimulatedDeviceTest, EveryFileSystemOperationCanFail) {
    for (const char* operation :
         {"createDirectory", "namesInDirectory", "attributesOfItem", "removeItem", "moveItem", "freeSpace"}) {
        device.failNext("FileSystem." + std::string(operation), EIO);
    }
    SimulatedFileSystem& files = *device.fileSystem;
    files.addFile("/file", 1);
    EXPECT_TRUE(files.createDirectory("/d"));
    EXPECT_FALSE(files.namesInDirectory("/"));
    EXPECT_FALSE(files.attributesOfItem("/file"));
    EXPECT_TRUE(files.removeItem("/file"));
    EXPECT_TRUE(files.moveItem("/file", "/other"));
    EXPECT_FALSE(files.freeSpace("/"));
    EXPECT_TRUE(files.itemExists("/file"));
}

TEST_F(SimulatedDeviceTest, ScriptLocksUnlocksAndSettles) {
    EXPECT_EQ(perform("lock"), std::nullopt);
    EXPECT_EQ(perform("settle"), std::nullopt);
    EXPECT_EQ(lockState(), 1U);
    EXPECT_EQ(perform("  unlock  "), std::nullopt);
    EXPECT_EQ(lockState(), 0U);
    EXPECT_EQ(perform("settle"), std::nullopt);
    EXPECT_EQ(lockEvents, 2);
}

TEST_F(SimulatedDeviceTest, ScriptMakesCalls) {
    const auto listener = std::make_shared<CallListener>();
    device.calls->setDelegate(listener);
    for (const char* line : {"ring", "dial", "hang-up", "settle"})
        EXPECT_EQ(perform(line), std::nullopt);
    EXPECT_THAT(listener->calls, ElementsAre("in", "out", "in ended"));
}

TEST_F(SimulatedDeviceTest, ScriptForbidsAndAllowsRecording) {
    const auto setting = [&] {
        return device.restrictions->effectiveSetting(kScreenRecordingAllowedRestriction);
    };
    EXPECT_EQ(setting(), RestrictionSetting::unspecified);
    EXPECT_EQ(perform("forbid-recording"), std::nullopt);
    EXPECT_EQ(setting(), RestrictionSetting::no);
    EXPECT_EQ(perform("allow-recording"), std::nullopt);
    EXPECT_EQ(setting(), RestrictionSetting::yes);
}

TEST_F(SimulatedDeviceTest, ScriptSetsTheLayout) {
    const auto levels = [&] {
        std::vector<int> all;
        for (const auto& element : device.displayLayout->createMonitor(0)->currentLayout().elements)
            all.push_back(element.level);
        return all;
    };
    EXPECT_EQ(perform("layout 0 1 -2"), std::nullopt);
    EXPECT_THAT(levels(), ElementsAre(0, 1, -2));
    EXPECT_EQ(perform("layout"), std::nullopt);
    EXPECT_THAT(levels(), ElementsAre());
}

TEST_F(SimulatedDeviceTest, ScriptSetsTheFreeSpace) {
    EXPECT_EQ(perform("free-space 123"), std::nullopt);
    EXPECT_EQ(*device.fileSystem->freeSpace("/"), 123U);
}

TEST_F(SimulatedDeviceTest, ScriptTakesTheMicrophoneAndGivesItBack) {
    std::vector<std::uint64_t> types;
    device.audio->session->setInterruptionHandler([&](std::uint64_t type) { types.push_back(type); });
    EXPECT_EQ(perform("take-microphone"), std::nullopt);
    EXPECT_EQ(perform("give-microphone-back"), std::nullopt);
    EXPECT_EQ(types, (std::vector<std::uint64_t>{kAudioInterruptionBegan, kAudioInterruptionEnded}));
}

TEST_F(SimulatedDeviceTest, ScriptLetsSoundBeHeard) {
    Bytes heard;
    const auto queue = *device.audio->createInputQueue(
        AudioFormatRecord::signed16(44100, 1),
        [&](const AudioQueueBufferRef& buffer, const AudioTimeStamp& start, std::uint32_t, auto) {
            EXPECT_EQ(start.hostTime, 0U);
            heard.assign(buffer->bytes.begin(),
                         buffer->bytes.begin() + static_cast<std::ptrdiff_t>(buffer->byteSize));
        },
        kAudioQueueTapsProcess);
    ASSERT_FALSE(queue->setTapProcess(7));
    ASSERT_FALSE(queue->enqueueBuffer(*queue->allocateBuffer(8820)));
    ASSERT_FALSE(queue->start());
    EXPECT_EQ(perform("sound 0.05"), std::nullopt);
    EXPECT_EQ(heard.size(), 4410U);
    EXPECT_EQ(device.clock->monotonicNow(), 50ms);
}

TEST_F(SimulatedDeviceTest, ScriptMovesTheClock) {
    EXPECT_EQ(perform("advance 1.5"), std::nullopt);
    EXPECT_EQ(device.clock->monotonicNow(), 1500ms);
    EXPECT_EQ(perform("advance 0"), std::nullopt);
    EXPECT_EQ(device.clock->monotonicNow(), 1500ms);
}

TEST_F(SimulatedDeviceTest, ScriptAnswersAlerts) {
    const std::vector<std::pair<const char*, SystemAlertResponse>> answers{
        {"answer default", SystemAlertResponse::defaultButton},
        {"answer alternate", SystemAlertResponse::alternateButton},
        {"answer other", SystemAlertResponse::otherButton},
        {"answer cancelled", SystemAlertResponse::cancelled}};
    for (const auto& [line, response] : answers) {
        EXPECT_EQ(perform(line), std::nullopt);
        EXPECT_EQ((*device.alerts->createAlert({}))->waitForResponse(), response);
    }
}

TEST_F(SimulatedDeviceTest, ScriptOrdersFailures) {
    EXPECT_EQ(perform("fail FileSystem.removeItem 13"), std::nullopt);
    EXPECT_EQ(device.fileSystem->removeItem("/none")->code(), EACCES);
}

TEST_F(SimulatedDeviceTest, ScriptPurges) {
    int urgency = 0;
    StoragePurgeCallbacks callbacks;
    callbacks.purge = [&](PurgeUrgency asked) {
        urgency = asked;
        return std::uint64_t{5};
    };
    device.storagePurge->registerCallbacks("store", callbacks);
    EXPECT_EQ(perform("purge 2"), std::nullopt);
    EXPECT_EQ(urgency, 2);
}

class BadScriptLineTest : public testing::TestWithParam<const char*> {};

TEST_P(BadScriptLineTest, FailsHavingDoneNothing) {
    SimulatedDevice device;
    const auto error = device.perform(GetParam());
    ASSERT_TRUE(error);
    EXPECT_EQ(error->code(), EINVAL);
    EXPECT_EQ(device.clock->monotonicNow(), 0s);
    EXPECT_EQ(*device.fileSystem->freeSpace("/"), 1000000000U);
    EXPECT_TRUE(device.displayLayout->createMonitor(0)->currentLayout().elements.empty());
}

INSTANTIATE_TEST_SUITE_P(Lines, BadScriptLineTest,
                         testing::Values("", "   ", "explode", "LOCK", "lock now", "unlock 1", "ring ring",
                                         "layout one", "layout 0 x", "free-space", "free-space -1",
                                         "free-space 1 2", "free-space 18446744073709551616", "advance",
                                         "advance -1", "advance nan", "advance inf", "advance 1e10",
                                         "advance 1s", "answer", "answer maybe", "answer default other",
                                         "fail", "fail FileSystem.removeItem", "fail FileSystem.removeItem x",
                                         "purge", "purge much", "sound", "sound 61", "sound x", "settle now",
                                         "forbid-recording 1", "allow-recording 1", "hang-up 1", "dial 1"));

}  // namespace
}  // namespace kelvo
