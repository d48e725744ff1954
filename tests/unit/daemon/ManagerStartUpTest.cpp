#include "ManagerFixture.h"
#include "daemon/RunDaemon.h"

#include <algorithm>

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class ManagerStartUpTest : public test::ManagerFixture {};

TEST_F(ManagerStartUpTest, ConstructionSetsUpTheStore) {
    createManager();
    EXPECT_TRUE(log.contains("_srSetupTempDirectory"));
    EXPECT_TRUE(device.fileSystem->itemExists(kStore));
}

TEST_F(ManagerStartUpTest, EveryServiceIsThere) {
    createManager();
    EXPECT_EQ(manager->connectionManager()->delegate(), manager);
    EXPECT_EQ(manager->sessionManager()->delegate(), manager);
    EXPECT_NE(manager->applicationStateMonitor(), nullptr);
    EXPECT_EQ(manager->callObserver(), device.calls);
    EXPECT_NE(manager->statusBarAssertion(), nullptr);
    EXPECT_NE(manager->dataProviderConnection(), nullptr);
    EXPECT_NE(manager->dataProviderProxy(), nullptr);
    EXPECT_EQ(manager->dataProviderQueue().label(), "com.quillon.kelvod.bulletinboard");
}

TEST_F(ManagerStartUpTest, StateBeginsEmpty) {
    createManager();
    EXPECT_FALSE(manager->isMicrophoneRecording());
    EXPECT_FALSE(manager->isCameraRecording());
    EXPECT_FALSE(manager->deviceLocked());
    EXPECT_EQ(manager->levelOneElementCount(), 0);
    EXPECT_EQ(manager->layoutMonitor(), nullptr);
    EXPECT_THAT(manager->exemptBundleIdentifiers().copy(), IsEmpty());
    EXPECT_THAT(manager->exemptWithMicRecordingEnabledBundleIdentifiers().copy(), IsEmpty());
    EXPECT_TRUE(manager->lastBackgroundDateByBundleIdentifier().copy().empty());
    EXPECT_TRUE(manager->currentAvailableExtensions().copy().empty());
    EXPECT_EQ(manager->userNotificationStopRecording().copy(), nullptr);
    EXPECT_FALSE(manager->photoAsset().copy());
    EXPECT_FALSE(manager->currentHostAppImage().copy());
    EXPECT_FALSE(manager->currentExtensionAppImage().copy());
    EXPECT_FALSE(manager->currentExtensionDisplayName().copy());
}

TEST_F(ManagerStartUpTest, LayoutMonitorIsNotCreatedBeforeTheFirstStart) {
    createManager();
    EXPECT_EQ(device.displayLayout->monitorCount(), 0);
}

TEST_F(ManagerStartUpTest, ListenerStaysSuspendedUntilStartUpIsFinished) {
    createManager();
    ASSERT_EQ(device.ipc->listeners().size(), 1U);
    const auto listener = device.ipc->listeners().front();
    EXPECT_EQ(listener->serviceName(), "com.quillon.kelvod");
    EXPECT_EQ(listener->delegate(), manager->connectionManager());
    EXPECT_EQ(listener->resumeCount(), 0);
    manager->finishStartup();
    EXPECT_EQ(listener->resumeCount(), 1);
}

TEST_F(ManagerStartUpTest, BulletinsOfAnEarlierProcessAreWithdrawn) {
    createManager();
    EXPECT_THAT(device.bulletins->requests(),
                ElementsAre("connect com.quillon.kelvod.bulletinboard com.quillon.kelvod.bulletinboard",
                            "register", "withdraw all"));
}

TEST_F(ManagerStartUpTest, ManagerObservesRestrictionsAndOffersPurging) {
    createManager();
    EXPECT_EQ(device.restrictions->observerCount(), 1U);
    EXPECT_TRUE(device.storagePurge->callbacks(kPurgeService));
}

TEST_F(ManagerStartUpTest, AlertQueueIsOneForTheProcess) {
    EXPECT_EQ(KVRecordingManager::kelvoAlertQueue().label(), "com.kelvokit.alertQueue");
    EXPECT_EQ(&KVRecordingManager::kelvoAlertQueue(), &KVRecordingManager::kelvoAlertQueue());
}

TEST_F(ManagerStartUpTest, LockIsWatchedOnAnOrdinaryBuildWithoutReadingThePreference) {
    device.preferences->set("KVEnableLockedRecording", true);
    createManager();
    EXPECT_EQ(device.notifications->observerCount(kBlankedScreenNotification), 1U);
    EXPECT_NE(manager->lockToResetToken(), 0);
    EXPECT_EQ(device.preferences->readCount(), 0);
}

TEST_F(ManagerStartUpTest, LockIsWatchedOnAnInternalBuildWithoutThePreference) {
    device.device->setInternalBuild(true);
    createManager();
    EXPECT_TRUE(log.contains("KVRecordingManager: enableLockedRecording=0"));
    EXPECT_EQ(device.notifications->observerCount(kBlankedScreenNotification), 1U);
}

TEST_F(ManagerStartUpTest, PreferenceThatIsFalseStillKeepsTheLockUnwatched) {
    device.device->setInternalBuild(true);
    device.preferences->set("KVEnableLockedRecording", false);
    createManager();
    EXPECT_TRUE(log.contains("KVRecordingManager: enableLockedRecording=1"));
    EXPECT_EQ(device.notifications->observerCount(kBlankedScreenNotification), 0U);
    EXPECT_EQ(manager->lockToResetToken(), 0);
}

TEST_F(ManagerStartUpTest, TearDownLeavesEveryService) {
    createManager();
    manager->setLayoutMonitor(device.displayLayout->createMonitor(0));
    manager->layoutMonitor()->addObserver(manager);
    manager.reset();
    EXPECT_EQ(device.displayLayout->observerCount(), 0U);
    EXPECT_TRUE(device.displayLayout->isAnyMonitorInvalidated());
    EXPECT_EQ(device.restrictions->observerCount(), 0U);
    EXPECT_EQ(device.notifications->removalCount("com.quillon.mobile.cofferd.lock_status"), 1);
}

TEST_F(ManagerStartUpTest, TearDownKeepsTheBlankedScreenRegistrationAsItAlwaysDid) {
    createManager();
    manager.reset();
    EXPECT_EQ(device.notifications->observerCount(kBlankedScreenNotification), 1U);
    device.lock();
    device.settle();
}

class RunDaemonTest : public test::ManagerFixture {};

TEST_F(RunDaemonTest, LoopThatReturnsEndsTheProcessWithMinusOne) {
    std::shared_ptr<SimulatedListener> listener;
    device.mainQueue->async([&] {
        listener = device.ipc->listeners().front();
        device.mainQueue->stop();
    });
    int readyCount = 0;
    const int status = runDaemon(
        device.platform(), [](const std::string&) { return nullptr; }, [&] { ++readyCount; });
    EXPECT_EQ(status, -1);
    EXPECT_EQ(readyCount, 1);
    EXPECT_EQ(log.texts().front(), "kelvod Starting!");
    EXPECT_EQ(listener->resumeCount(), 1);
    EXPECT_EQ(device.restrictions->observerCount(), 0U) << "the manager is torn down";
}

}  // namespace
}  // namespace kelvo
