#include "ManagerStartFixture.h"

namespace kelvo {
namespace {

using test::Answer;
using testing::ElementsAre;

using ManagerStartRefusalTest = test::ManagerStartFixture;

TEST_F(ManagerStartRefusalTest, ActiveInCarDisplayRefuses) {
    device.inCarDisplay->setActive(true);
    startInApp();
    expectRefusal(*application, -5813, true);
}

TEST_F(ManagerStartRefusalTest, UnknownInCarDisplayRefusesNothing) {
    device.inCarDisplay->setActive(true);
    device.failNext("InCarDisplay.isActive", EIO);
    accept();
    startInApp();
    EXPECT_TRUE(application->recording);
}

TEST_F(ManagerStartRefusalTest, SystemRecordingNeedsTheEntitlement) {
    callFrom(10);
    request(true, handler());
    expectRefusal(*application, -5810, true);
}

TEST_F(ManagerStartRefusalTest, ForeignOrUnknownWindowsAreRefused) {
    for (const std::uint32_t foreign : {8U, 9U}) {
        answers.clear();
        contexts = {7, foreign};
        startInApp();
        expectRefusal(*application, -5803, false);
    }
    EXPECT_FALSE(log.contains("KVRecordingManager:stopCurrentRecordingSession:"));
}

TEST_F(ManagerStartRefusalTest, NoWindowsAtAllPass) {
    contexts = {};
    accept();
    startInApp();
    EXPECT_TRUE(application->recording);
}

TEST_F(ManagerStartRefusalTest, FreeSpaceMustBeAboveTheBound) {
    device.setFreeSpace(100000000);
    startInApp();
    expectRefusal(*application, -5805, true);
    EXPECT_TRUE(log.contains("insufficient disk space for recording, calling handler with error"));
    device.setFreeSpace(100000001);
    accept();
    startInApp();
    EXPECT_TRUE(application->recording);
}

TEST_F(ManagerStartRefusalTest, ApplicationInTheBackgroundIsRefused) {
    device.applications->change({kApplicationStateForegroundObscured, 10, true, "com.example.app"});
    startInApp();
    expectRefusal(*application, -5803, false);
    EXPECT_TRUE(log.contains("app is not in the foreground, calling handler with error"));
}

TEST_F(ManagerStartRefusalTest, CallerWithoutASessionIsRefused) {
    addApplication(12, "com.example.other", {{"com.quillon.private.kelvo-kit", true}});
    callFrom(12);
    request(true, handler());
    EXPECT_THAT(answers, ElementsAre(Answer{-5803, false, false}));
}

TEST_F(ManagerStartRefusalTest, LockedDeviceRefusesWhoeverWantsAnAnswer) {
    manager->setDeviceLocked(true);
    startSystem();
    expectRefusal(*system, -5809, true);
    EXPECT_TRUE(log.contains("failed to start system recording because device was in locked state"));
    startSystem(nullptr);
    EXPECT_TRUE(system->recording);
}

TEST_F(ManagerStartRefusalTest, LockedDeviceDoesNotConcernApplications) {
    manager->setDeviceLocked(true);
    accept();
    startInApp();
    EXPECT_TRUE(application->recording);
}

TEST_F(ManagerStartRefusalTest, DecliningUserRefuses) {
    device.answerAlert(SystemAlertResponse::defaultButton);
    startInApp();
    expectRefusal(*application, -5801, false);
    EXPECT_TRUE(log.contains("user declined"));
    EXPECT_FALSE(log.contains("starting..."));
    EXPECT_TRUE(manager->isMicrophoneRecording()) << "what was asked for stays";
}

TEST_F(ManagerStartRefusalTest, SplitScreenRefusesAfterTheUserWasAsked) {
    device.setLayout({0, 1});
    accept();
    startInApp();
    expectRefusal(*application, -5807, false);
    EXPECT_EQ(device.alerts->shownAlerts().size(), 1U);
    EXPECT_TRUE(log.contains("attempted to start recording in split mode, bailing out"));
    startSystem();
    EXPECT_TRUE(system->recording) << "the whole screen may be split";
    EXPECT_EQ(manager->levelOneElementCount(), 2);
}

TEST_F(ManagerStartRefusalTest, BroadcastWithoutASetUpIsRefusedWithoutAText) {
    broadcast = true;
    accept();
    startInApp();
    expectRefusal(*application, -5808, true);
    EXPECT_EQ(lastError, KVError(std::string(KVRecordingErrorDomain), -5808));
    EXPECT_TRUE(log.contains("attempted to start broadcast without a session, bailing out"));
}

TEST_F(ManagerStartRefusalTest, BroadcastThatCannotBeEnabledRefusesWhoeverWantsAnAnswer) {
    broadcast = true;
    application->extension = Dictionary();
    application->broadcastError = KVError("domain", 5);
    accept();
    startInApp();
    expectRefusal(*application, 5, true);
    request(false, nullptr);
    EXPECT_TRUE(application->recording);
}

}  // namespace
}  // namespace kelvo
