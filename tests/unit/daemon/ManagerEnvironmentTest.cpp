#include "ManagerFixture.h"

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class ManagerEnvironmentTest : public test::ManagerFixture {
  protected:
    ManagerEnvironmentTest() {
        createManager();
        system = recordingSystemSession();
        application = recordingSession("com.example.app");
    }
    void finishSystem() { system->completeFinish(URL::file("/movie.mp4"), std::nullopt); }

    std::shared_ptr<test::FakeRecordingSession> system;
    std::shared_ptr<test::FakeRecordingSession> application;
};

TEST_F(ManagerEnvironmentTest, BlankedScreenStopsTheSystemRecordingAlone) {
    device.lock();
    device.settle();
    EXPECT_TRUE(manager->deviceLocked());
    finishSystem();
    EXPECT_THAT(stopCodes(*system), ElementsAre(-5806));
    EXPECT_THAT(application->requests, IsEmpty());
}

TEST_F(ManagerEnvironmentTest, ScreenThatComesBackOnlyClearsTheState) {
    manager->setDeviceLocked(true);
    device.unlock();
    device.settle();
    EXPECT_FALSE(manager->deviceLocked());
    EXPECT_THAT(system->requests, IsEmpty());
}

TEST_F(ManagerEnvironmentTest, AnyStateButZeroIsLocked) {
    device.notifications->post(kBlankedScreenNotification, 0x100000000);
    device.settle();
    EXPECT_TRUE(manager->deviceLocked());
}

TEST_F(ManagerEnvironmentTest, IncomingCallStopsTheSystemRecordingAlone) {
    device.ring();
    device.settle();
    finishSystem();
    EXPECT_THAT(stopCodes(*system), ElementsAre(-5806));
    EXPECT_THAT(application->requests, IsEmpty());
}

TEST_F(ManagerEnvironmentTest, OutgoingAndEndedCallsChangeNothing) {
    device.dial();
    device.hangUp();
    device.settle();
    EXPECT_THAT(system->requests, IsEmpty());
}

TEST_F(ManagerEnvironmentTest, ForbiddenRecordingStopsEverySession) {
    device.setScreenRecordingAllowed(false);
    EXPECT_THAT(system->requests, ElementsAre("finishSessionWithStartClipDuration"));
    EXPECT_THAT(application->requests, ElementsAre("finishSessionWithStartClipDuration"));
    application->completeFinish(std::nullopt, std::nullopt);
    ASSERT_EQ(application->client->lockInterruptions.copy().size(), 1U);
    EXPECT_EQ(application->client->lockInterruptions.copy().front().code(), -5809);
}

TEST_F(ManagerEnvironmentTest, AllowedOrUnspecifiedRecordingStopsNothing) {
    device.setScreenRecordingAllowed(true);
    device.restrictions->change(kScreenRecordingAllowedRestriction, RestrictionSetting::unspecified);
    EXPECT_THAT(system->requests, IsEmpty());
    EXPECT_THAT(application->requests, IsEmpty());
}

struct LayoutCase {
    const char* name;
    std::vector<int> levels;
    std::int64_t count;
    bool stops;
};

class ManagerLayoutTest : public ManagerEnvironmentTest, public testing::WithParamInterface<LayoutCase> {};

TEST_P(ManagerLayoutTest, LayoutDecidesAboutInAppRecordings) {
    manager->setLayoutMonitor(device.displayLayout->createMonitor(0));
    manager->layoutMonitor()->addObserver(manager);
    device.setLayout(GetParam().levels);
    EXPECT_EQ(manager->levelOneElementCount(), GetParam().count);
    EXPECT_EQ(application->requests.size(), GetParam().stops ? 1U : 0U);
    EXPECT_THAT(system->requests, IsEmpty());
    if (!GetParam().stops) return;
    application->completeFinish(URL::file("/a.mp4"), std::nullopt);
    EXPECT_THAT(stopCodes(*application), ElementsAre(-5807));
    EXPECT_EQ(application->client->stops.copy().front().movieURL, URL::file("/a.mp4"));
}

INSTANTIATE_TEST_SUITE_P(Layouts, ManagerLayoutTest,
                         testing::Values(LayoutCase{"OneApplication", {1}, 1, false},
                                         LayoutCase{"TwoApplications", {0, 1}, 2, true},
                                         LayoutCase{"ApplicationUnderAnOverlay", {1, 2}, 1, false},
                                         LayoutCase{"TwoApplicationsUnderAnOverlay", {1, 1, 2}, 2, false},
                                         LayoutCase{"NoElements", {}, 0, true},
                                         LayoutCase{"OneOverlay", {5}, 0, false},
                                         LayoutCase{"NegativeLevels", {-1, 0}, 2, true}),
                         [](const auto& test) { return test.param.name; });

TEST(LevelOneCountTest, CountsElementsBelowLevelTwo) {
    EXPECT_EQ(KVRecordingManager::countLevelOneElementsWithLayout({}), 0);
    EXPECT_EQ(KVRecordingManager::countLevelOneElementsWithLayout({{{-3}, {0}, {1}, {2}, {9}}}), 3);
}

}  // namespace
}  // namespace kelvo
