#include "ManagerFixture.h"

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class Assertion : public StatusBarStyleAssertion {
  public:
    std::string statusString() override { return {}; }
    void setStatusString(std::string) override {}
    void invalidate() override { ++invalidations; }
    int invalidations = 0;
};

class Coordinator : public StatusBarCoordinator {
  public:
    void setRegisteredStyleOverrides(std::uint32_t styleBits, ErrorHandler reply) override {
        styles.push_back(styleBits);
        repliesWanted += reply ? 1 : 0;
    }
    std::vector<std::uint32_t> styles;
    int repliesWanted = 0;
};

class ManagerStopTest : public test::ManagerFixture {
  protected:
    ManagerStopTest() { createManager(); }

    void showIndicator() {
        manager->statusBarAssertion()->setAssertion(assertion);
        manager->statusBarAssertion()->setCoordinator(coordinator);
        timer = device.mainQueue->scheduleRepeating(std::chrono::milliseconds(500), [] {});
        manager->statusBarAssertion()->setTimer(timer);
    }

    std::shared_ptr<Assertion> assertion = std::make_shared<Assertion>();
    std::shared_ptr<Coordinator> coordinator = std::make_shared<Coordinator>();
    std::shared_ptr<RepeatingTimer> timer;
};

TEST_F(ManagerStopTest, ResetClearsTheSessionsState) {
    const auto recording = recordingSession("a");
    recording->paused = true;
    recording->extension = Dictionary{{"k", 1}};
    manager->resetStatesForSession(recording);
    EXPECT_TRUE(log.contains("KVRecordingManager:resetStatesForSession:"));
    EXPECT_FALSE(recording->recording);
    EXPECT_FALSE(recording->paused);
    EXPECT_FALSE(recording->extension);
}

TEST_F(ManagerStopTest, PreparationForgetsTheBroadcastsImages) {
    manager->currentHostAppImage().set(Bytes(3));
    manager->currentExtensionAppImage().set(Bytes(3));
    manager->currentExtensionDisplayName().set("service");
    manager->prepareForStoppingSession(session("a"));
    EXPECT_FALSE(manager->currentHostAppImage().copy());
    EXPECT_FALSE(manager->currentExtensionAppImage().copy());
    EXPECT_FALSE(manager->currentExtensionDisplayName().copy());
}

TEST_F(ManagerStopTest, PreparationStopsWatchingTheLayoutOfARecordingSessionOnly) {
    manager->setLayoutMonitor(device.displayLayout->createMonitor(0));
    manager->layoutMonitor()->addObserver(manager);
    manager->prepareForStoppingSession(session("a"));
    EXPECT_EQ(device.displayLayout->observerCount(), 1U);
    manager->prepareForStoppingSession(recordingSession("a"));
    EXPECT_EQ(device.displayLayout->observerCount(), 0U);
}

TEST_F(ManagerStopTest, MissingSessionIsPreparedAndResetWithoutHarm) {
    manager->prepareForStoppingSession(nullptr);
    manager->resetStatesForSession(nullptr);
    manager->recordingSessionStoppedWithError(nullptr, std::nullopt, std::nullopt);
}

TEST_F(ManagerStopTest, StopOfTheSystemRecordingTakesItsIndicatorsAway) {
    showIndicator();
    const auto alert = *device.alerts->createAlert({});
    manager->userNotificationStopRecording().set(alert);
    manager->prepareForStoppingSession(recordingSystemSession());
    EXPECT_TRUE(log.contains("stop monitoring foreground apps"));
    EXPECT_EQ(alert->waitForResponse(), SystemAlertResponse::cancelled);
    EXPECT_EQ(assertion->invalidations, 1);
    EXPECT_THAT(coordinator->styles, ElementsAre(0U));
    EXPECT_EQ(coordinator->repliesWanted, 0);
    EXPECT_FALSE(timer->isValid());
    EXPECT_TRUE(log.contains("KVStatusBarAssertion: double height status bar assertion released"));
}

TEST_F(ManagerStopTest, StopOfAnInAppRecordingLeavesTheIndicatorsAlone) {
    showIndicator();
    manager->prepareForStoppingSession(recordingSession("a"));
    EXPECT_EQ(assertion->invalidations, 0);
    EXPECT_FALSE(log.contains("stop monitoring foreground apps"));
}

TEST_F(ManagerStopTest, IndicatorWithoutAnAssertionIsLeftAsItIs) {
    showIndicator();
    manager->statusBarAssertion()->setAssertion(nullptr);
    manager->statusBarAssertion()->invalidateDoubleHeightStatusBar();
    EXPECT_TRUE(timer->isValid());
    EXPECT_THAT(coordinator->styles, IsEmpty());
}

TEST_F(ManagerStopTest, StoppedReportReachesTheClient) {
    const auto recording = recordingSession("a");
    const KVError error("domain", -5804);
    manager->recordingSessionStoppedWithError(recording, error, URL::file("/a.mp4"));
    EXPECT_TRUE(log.contains("KVRecordingManager:recordingSessionStoppedWithError:movieURL:"));
    EXPECT_THAT(recording->client->stops.copy(),
                ElementsAre(test::FakeClientProxy::Stop{error, URL::file("/a.mp4")}));
}

TEST_F(ManagerStopTest, FailedSaveIsLogged) {
    manager->failedToSaveRecordingForRecordingSession(session("a"), KVError("domain", -5812));
    EXPECT_TRUE(log.contains("KVRecordingManager:saveVideoToCameraRoll: Video saved to camera roll failed"));
}

}  // namespace
}  // namespace kelvo
