#include "SessionManagerFixture.h"

#include <thread>

namespace kelvo {
namespace {

using test::kPicker;
using test::kShell;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::UnorderedElementsAre;

class KVSessionManagerRegistryTest : public test::SessionManagerFixture {};

TEST_F(KVSessionManagerRegistryTest, UnknownBundleGetsANewSession) {
    const auto session = manager.recordingSessionInstanceWithBundleIdentifier("com.example.a");
    ASSERT_NE(session, nullptr);
    EXPECT_EQ(session->bundleID(), "com.example.a");
    EXPECT_THAT(log.texts(), ElementsAre("KVSessionManager:recordingSessionInstanceWithBundleIdentifier",
                                         "no session, creating a new one"));
}

TEST_F(KVSessionManagerRegistryTest, KnownBundleGetsTheSameSession) {
    const auto first = manager.recordingSessionInstanceWithBundleIdentifier("com.example.a");
    log.clear();
    EXPECT_EQ(manager.recordingSessionInstanceWithBundleIdentifier("com.example.a"), first);
    EXPECT_THAT(createdSessions, ElementsAre("com.example.a"));
    EXPECT_THAT(log.texts(), ElementsAre("KVSessionManager:recordingSessionInstanceWithBundleIdentifier"));
}

TEST_F(KVSessionManagerRegistryTest, EachBundleHasASessionOfItsOwn) {
    EXPECT_NE(manager.recordingSessionInstanceWithBundleIdentifier("com.example.a"),
              manager.recordingSessionInstanceWithBundleIdentifier("com.example.b"));
}

TEST_F(KVSessionManagerRegistryTest, MissingIdentifierGetsNoSession) {
    EXPECT_EQ(manager.recordingSessionInstanceWithBundleIdentifier(""), nullptr);
    EXPECT_THAT(createdSessions, IsEmpty());
    EXPECT_THAT(log.texts(), ElementsAre("KVSessionManager:recordingSessionInstanceWithBundleIdentifier",
                                         "cannot create session without bundle identifier"));
}

TEST_F(KVSessionManagerRegistryTest, PickerAndShellShareTheSystemSession) {
    const auto session = manager.recordingSessionInstanceWithBundleIdentifier(kPicker);
    ASSERT_NE(session, nullptr);
    EXPECT_EQ(session->bundleID(), kShell);
    EXPECT_TRUE(log.contains("no session, creating a new one"));
    EXPECT_EQ(manager.recordingSessionInstanceWithBundleIdentifier(kShell), session);
    EXPECT_EQ(manager.getSystemRecordingSession(), session);
    EXPECT_THAT(createdSessions, ElementsAre(kShell));
}

TEST_F(KVSessionManagerRegistryTest, OnlyTheTwoExactIdentifiersMayRecordTheSystem) {
    const auto isEligible = &KVSessionManager::clientEligibleForSystemRecordingWithBundleIdentifier;
    EXPECT_TRUE(isEligible("com.quillon.KelvoKit.KVBroadcastPicker"));
    EXPECT_TRUE(isEligible("com.quillon.plinth"));
    for (const char* other : {"", "com.quillon.Plinth", "com.quillon.plinth ", "com.quillon.plinth.app",
                              "com.quillon.KelvoKit", "com.quillon.kelvokit.kvbroadcastpicker"}) {
        EXPECT_FALSE(isEligible(other)) << other;
    }
}

TEST_F(KVSessionManagerRegistryTest, LookUpNeverCreates) {
    EXPECT_EQ(manager.getRecordingSessionWithBundleIdentifier("com.example.a"), nullptr);
    EXPECT_EQ(manager.getRecordingSessionWithBundleIdentifier(kShell), nullptr);
    EXPECT_EQ(manager.getRecordingSessionWithBundleIdentifier(kPicker), nullptr);
    EXPECT_EQ(manager.getSystemRecordingSession(), nullptr);
    EXPECT_THAT(createdSessions, IsEmpty());
    EXPECT_THAT(log.texts(), IsEmpty());
}

TEST_F(KVSessionManagerRegistryTest, LookUpFindsWhatWasCreated) {
    const auto app = idle("com.example.a");
    const auto system = idle(kShell);
    EXPECT_EQ(manager.getRecordingSessionWithBundleIdentifier("com.example.a"), app);
    EXPECT_EQ(manager.getRecordingSessionWithBundleIdentifier(kShell), system);
    EXPECT_EQ(manager.getRecordingSessionWithBundleIdentifier(kPicker), system);
}

TEST_F(KVSessionManagerRegistryTest, CurrentSessionIsTheSystemOneBeforeAnyOther) {
    recording("com.example.a");
    const auto system = recording(kShell);
    EXPECT_EQ(manager.getCurrentRecordingSession(), system);
}

TEST_F(KVSessionManagerRegistryTest, CurrentSessionIsTheFirstRecordingOneOfTheApplications) {
    idle(kShell);
    idle("com.example.a");
    const auto second = recording("com.example.c");
    const auto first = recording("com.example.b");
    EXPECT_EQ(manager.getCurrentRecordingSession(), first);
    first->recording = false;
    EXPECT_EQ(manager.getCurrentRecordingSession(), second);
}

TEST_F(KVSessionManagerRegistryTest, WithoutARecordingThereIsNoCurrentSession) {
    EXPECT_EQ(manager.getCurrentRecordingSession(), nullptr);
    idle(kShell);
    idle("com.example.a");
    EXPECT_EQ(manager.getCurrentRecordingSession(), nullptr);
}

TEST_F(KVSessionManagerRegistryTest, ActiveSessionsAreThoseThatRecord) {
    const auto system = recording(kShell);
    const auto app = recording("com.example.a");
    idle("com.example.b");
    EXPECT_THAT(manager.getActiveRecordingSessions(), UnorderedElementsAre(system, app));
    system->recording = false;
    EXPECT_THAT(manager.getActiveRecordingSessions(), UnorderedElementsAre(app));
}

TEST_F(KVSessionManagerRegistryTest, SystemSessionIsNeverAnActiveInAppSession) {
    recording(kShell);
    const auto app = recording("com.example.a");
    idle("com.example.b");
    EXPECT_THAT(manager.getActiveInAppRecordingSessions(), UnorderedElementsAre(app));
}

TEST_F(KVSessionManagerRegistryTest, RemovedSessionIsForgotten) {
    const auto first = idle("com.example.a");
    manager.removeInAppSessionWithBundleIdentifier("com.example.a");
    EXPECT_EQ(manager.getRecordingSessionWithBundleIdentifier("com.example.a"), nullptr);
    EXPECT_NE(manager.recordingSessionInstanceWithBundleIdentifier("com.example.a"), first);
}

TEST_F(KVSessionManagerRegistryTest, RemovalOfAnUnknownOrSystemIdentifierDoesNothing) {
    const auto system = idle(kShell);
    const auto app = idle("com.example.a");
    manager.removeInAppSessionWithBundleIdentifier("com.example.b");
    manager.removeInAppSessionWithBundleIdentifier(kShell);
    EXPECT_EQ(manager.getSystemRecordingSession(), system);
    EXPECT_EQ(manager.getRecordingSessionWithBundleIdentifier("com.example.a"), app);
}

TEST_F(KVSessionManagerRegistryTest, DelegateIsHeldWeakly) {
    EXPECT_EQ(manager.delegate(), delegate);
    delegate.reset();
    EXPECT_EQ(manager.delegate(), nullptr);
}

TEST(KVSessionManagerThreadsTest, ThreadsThatAskAtOnceGetOneSession) {
    KVSessionManager manager(
        [](const std::string& bundleID) { return std::make_shared<test::FakeRecordingSession>(bundleID); },
        nullptr);
    std::vector<SessionRef> seen(8);
    std::vector<std::thread> threads;
    threads.reserve(seen.size());
    for (SessionRef& place : seen) {
        threads.emplace_back(
            [&] { place = manager.recordingSessionInstanceWithBundleIdentifier("com.example.a"); });
    }
    for (std::thread& thread : threads)
        thread.join();
    for (const SessionRef& session : seen)
        EXPECT_EQ(session, manager.getRecordingSessionWithBundleIdentifier("com.example.a"));
}

}  // namespace
}  // namespace kelvo
