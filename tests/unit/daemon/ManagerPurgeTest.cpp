#include "ManagerFixture.h"

#include <cerrno>

namespace kelvo {
namespace {

using namespace std::chrono_literals;
using testing::ElementsAre;
using testing::IsEmpty;

class ManagerPurgeTest : public test::ManagerFixture {
  protected:
    ManagerPurgeTest() {
        createManager();
        device.fileSystem->addFile(oldFile, 100, 25h);
        device.fileSystem->addFile(newFile, 10, 1h);
        callbacks = *device.storagePurge->callbacks(kPurgeService);
    }
    bool exists(const std::string& path) { return device.fileSystem->itemExists(path); }

    const std::string oldFile = std::string(kStore) + "old.mp4";
    const std::string newFile = std::string(kStore) + "new.mp4";
    StoragePurgeCallbacks callbacks;
};

TEST_F(ManagerPurgeTest, PurgeableSpaceIsTheSizeOfTheStoresOwnEntry) {
    EXPECT_EQ(callbacks.purgeableSpace(1), 4096);
    EXPECT_TRUE(log.contains("KVRecordingManager: cache delete purgeable space callback"));
}

TEST_F(ManagerPurgeTest, LowUrgencyWithoutASessionDeletesNothing) {
    EXPECT_EQ(callbacks.purge(2), 0U);
    EXPECT_TRUE(log.contains("KVRecordingManager: cache delete purge callback"));
    EXPECT_TRUE(exists(oldFile));
}

TEST_F(ManagerPurgeTest, LowUrgencyWhileRecordingDeletesNothing) {
    const auto recording = recordingSession("a");
    EXPECT_EQ(callbacks.purge(2), 0U);
    EXPECT_TRUE(exists(oldFile));
    EXPECT_THAT(recording->requests, IsEmpty());
}

/// A session that stops recording while it is looked at: current when it is found, idle when it is asked.
class JustStoppedSession : public test::FakeRecordingSession {
  public:
    using FakeRecordingSession::FakeRecordingSession;
    bool isRecording() const override { return questions_++ == 0; }

  private:
    mutable int questions_ = 0;
};

TEST_F(ManagerPurgeTest, LowUrgencyWithASessionThatIsNotRecordingDeletesWhatIsOlderThanADay) {
    manager = KVRecordingManager::create(device.platform(), [](const std::string& bundleID) {
        return std::make_shared<JustStoppedSession>(bundleID);
    });
    manager->sessionManager()->recordingSessionInstanceWithBundleIdentifier("a");
    EXPECT_EQ(device.storagePurge->purge(2), 100U);
    EXPECT_FALSE(exists(oldFile));
    EXPECT_TRUE(exists(newFile));
}

TEST_F(ManagerPurgeTest, HighestUrgencyWithoutASessionDeletesEveryFile) {
    EXPECT_EQ(callbacks.purge(3), 110U);
    EXPECT_FALSE(exists(newFile));
}

TEST_F(ManagerPurgeTest, HighestUrgencyStopsTheRecordingAndReportsTheLackOfStorage) {
    const auto recording = recordingSession("a");
    recording->onRequest = [&](const std::string&) {
        EXPECT_TRUE(exists(newFile)) << "stopped before the deletion";
    };
    EXPECT_EQ(callbacks.purge(4), 110U);
    EXPECT_THAT(recording->requests, ElementsAre("finishAndCleanupSessionFiles"));
    EXPECT_TRUE(log.contains("recording stopped without handler!"));
    EXPECT_TRUE(log.contains("KVRecordingManager:recordingSessionStoppedWithError:movieURL:"));
    EXPECT_THAT(stopCodes(*recording), ElementsAre(-5805));
    EXPECT_FALSE(recording->client->stops.copy().front().movieURL);
}

TEST_F(ManagerPurgeTest, HighestUrgencyFinishesABroadcastInsteadOfDiscardingIt) {
    const auto broadcast = recordingSession("a");
    broadcast->broadcasting = true;
    callbacks.purge(3);
    EXPECT_THAT(broadcast->requests, ElementsAre("finishSessionWithStartClipDuration"));
    EXPECT_THAT(broadcast->clips, ElementsAre(test::FakeRecordingSession::Clip{0, 0}));
}

TEST_F(ManagerPurgeTest, CancelHandsItsArgumentBack) {
    EXPECT_EQ(callbacks.cancel(42), 42U);
}

TEST_F(ManagerPurgeTest, PeriodicCallbackDeletesWhatIsOlderThanADay) {
    EXPECT_EQ(callbacks.periodic(), 100U);
    EXPECT_TRUE(log.contains("KVRecordingManager: cache delete periodic callback"));
    EXPECT_TRUE(log.contains("_srDeleteFilesOlderThanTimeToLiveInSeconds: 86400"));
    EXPECT_TRUE(exists(newFile));
}

TEST_F(ManagerPurgeTest, CallbacksOutliveTheManagerWithoutEffect) {
    manager.reset();
    EXPECT_EQ(callbacks.purgeableSpace(3), 0);
    EXPECT_EQ(callbacks.purge(3), 0U);
    EXPECT_EQ(callbacks.periodic(), 0U);
    EXPECT_TRUE(exists(oldFile));
}

}  // namespace
}  // namespace kelvo
