#include "platform/linux/storage/VolumeWatcher.h"
#include "platform/simulated/SimulatedClock.h"
#include "platform/simulated/SimulatedFileSystem.h"

#include <future>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

class VolumeWatcherTest : public testing::Test {
  protected:
    static StoragePurgeCallbacks callbacksWith(std::function<std::uint64_t(PurgeUrgency)> purge) {
        return {[](PurgeUrgency) { return 0; }, std::move(purge),
                [](std::uint64_t argument) { return argument; }, [] { return 0U; }};
    }

    std::shared_ptr<SimulatedClock> clock = std::make_shared<SimulatedClock>();
    std::shared_ptr<SimulatedFaults> faults = std::make_shared<SimulatedFaults>();
    std::shared_ptr<SimulatedFileSystem> files = std::make_shared<SimulatedFileSystem>(clock, faults);
};

TEST_F(VolumeWatcherTest, ShortSpaceReachesTheCallback) {
    VolumeWatcher watcher(files, clock, "/store", std::chrono::milliseconds(1));
    files->setFreeSpace(1000);
    std::promise<PurgeUrgency> asked;
    watcher.registerCallbacks("x", callbacksWith([&](PurgeUrgency urgency) {
                                  asked.set_value(urgency);
                                  return 0U;
                              }));
    EXPECT_EQ(asked.get_future().get(), 3);
}

TEST_F(VolumeWatcherTest, UnreadableVolumeAsksForNothing) {
    VolumeWatcher watcher(files, clock, "/store", std::chrono::milliseconds(1));
    files->setFreeSpace(1000);
    faults->failNext("FileSystem.freeSpace", KVError::posix(5, ""));
    std::promise<void> asked;
    watcher.registerCallbacks("x", callbacksWith([&](PurgeUrgency) {
                                  asked.set_value();
                                  return 0U;
                              }));
    asked.get_future().get();
    EXPECT_EQ(faults->take("FileSystem.freeSpace"), std::nullopt) << "the look that failed came first";
}

TEST_F(VolumeWatcherTest, DestructionDoesNotWaitForTheNextLook) {
    VolumeWatcher watcher(files, clock, "/store", std::chrono::hours(1));
    watcher.registerCallbacks("x", callbacksWith([](PurgeUrgency) { return 0U; }));
}

}  // namespace
}  // namespace kelvo
