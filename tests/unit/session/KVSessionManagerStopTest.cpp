#include "SessionManagerFixture.h"

namespace kelvo {
namespace {

using test::kFailure;
using test::kMovie;
using test::kPicker;
using test::kShell;
using testing::ElementsAre;
using testing::IsEmpty;

const std::string kApp = "com.example.a";

class KVSessionManagerStopTest : public test::SessionManagerFixture {
  protected:
    void saveEndsWith(const OptionalError& error) {
        ASSERT_EQ(delegate->saveCompletions.size(), 1U);
        delegate->saveCompletions.front()(error);
    }
};

TEST_F(KVSessionManagerStopTest, SessionThatIsNotRecordingAnswersNoneAndNone) {
    manager.stopRecordingSession(idle(kApp), 1, 2, noteOutcome());
    EXPECT_THAT(diary, ElementsAre("prepare " + kApp, "handler (none, none)"));
}

TEST_F(KVSessionManagerStopTest, SessionThatIsNotRecordingNeedsNoHandler) {
    manager.stopRecordingSession(idle(kApp), 1, 2, nullptr);
    EXPECT_THAT(diary, ElementsAre("prepare " + kApp));
    EXPECT_FALSE(log.contains("recording stopped without handler!"));
}

TEST_F(KVSessionManagerStopTest, MissingSessionIsPreparedForAndAnswersNoneAndNone) {
    manager.stopRecordingSession(nullptr, 0, 0, noteOutcome());
    EXPECT_THAT(diary, ElementsAre("prepare nothing", "handler (none, none)"));
}

TEST_F(KVSessionManagerStopTest, RecordingWithoutAHandlerIsThrownAway) {
    const auto session = recording(kApp);
    manager.stopRecordingSession(session, 1, 2, nullptr);
    EXPECT_THAT(diary, ElementsAre("prepare " + kApp, kApp + ": finishAndCleanupSessionFiles"));
    EXPECT_EQ(log.count("recording stopped without handler!"), 1U);
    diary.clear();
    session->completeCleanup();
    EXPECT_THAT(diary, ElementsAre(kApp + "'s client: updateScreenRecordingState", "reset " + kApp));
    EXPECT_THAT(delegate->saveCompletions, IsEmpty());
}

TEST_F(KVSessionManagerStopTest, RecordingThatTheHandlerStartsIsNotReset) {
    const auto session = recording(kApp);
    manager.stopRecordingSession(session, 0, 0, [&](const auto&, const auto&) { session->recording = true; });
    diary.clear();
    session->completeFinish(kMovie, std::nullopt);
    EXPECT_THAT(diary, ElementsAre(kApp + "'s client: updateScreenRecordingState"));
    EXPECT_TRUE(session->recording);
}

TEST_F(KVSessionManagerStopTest, BroadcastWithoutAHandlerIsFinished) {
    const auto session = recording(kApp);
    session->broadcasting = true;
    manager.stopRecordingSession(session, 1, 2, nullptr);
    EXPECT_THAT(session->requests, ElementsAre("finishSessionWithStartClipDuration"));
    EXPECT_FALSE(log.contains("recording stopped without handler!"));
    diary.clear();
    session->completeFinish(std::nullopt, std::nullopt);
    EXPECT_THAT(diary, ElementsAre(kApp + "'s client: updateScreenRecordingState", "reset " + kApp));
}

TEST_F(KVSessionManagerStopTest, ClipDurationsReachTheSession) {
    const auto session = recording(kApp);
    manager.stopRecordingSession(session, 1.5, 2.5, noteOutcome());
    EXPECT_THAT(session->clips, ElementsAre(test::FakeRecordingSession::Clip{1.5, 2.5}));
}

TEST_F(KVSessionManagerStopTest, FinishedMovieGoesToTheHandlerBeforeClientAndDelegate) {
    const auto session = recording(kApp);
    manager.stopRecordingSession(session, 0, 0, noteOutcome());
    diary.clear();
    session->completeFinish(kMovie, std::nullopt);
    EXPECT_THAT(diary, ElementsAre("handler (file:///store//movie.mp4, none)",
                                   kApp + "'s client: updateScreenRecordingState", "reset " + kApp));
}

TEST_F(KVSessionManagerStopTest, ErrorWithoutAMovieIsAFailureToSave) {
    const auto session = recording(kApp);
    manager.stopRecordingSession(session, 0, 0, noteOutcome());
    diary.clear();
    session->completeFinish(std::nullopt, kFailure);
    EXPECT_THAT(diary, ElementsAre("handler (none, -7)", kApp + "'s client: updateScreenRecordingState",
                                   "failed to save " + kApp, "reset " + kApp));
    EXPECT_THAT(delegate->saveFailures, ElementsAre(kFailure));
}

TEST_F(KVSessionManagerStopTest, ErrorBesideAMovieIsNoFailureToSave) {
    const auto session = recording(kApp);
    manager.stopRecordingSession(session, 0, 0, noteOutcome());
    diary.clear();
    session->completeFinish(kMovie, kFailure);
    EXPECT_THAT(diary, ElementsAre("handler (file:///store//movie.mp4, -7)",
                                   kApp + "'s client: updateScreenRecordingState", "reset " + kApp));
}

TEST_F(KVSessionManagerStopTest, NeitherMovieNorErrorIsNoFailureToSave) {
    const auto session = recording(kApp);
    manager.stopRecordingSession(session, 0, 0, noteOutcome());
    session->completeFinish(std::nullopt, std::nullopt);
    EXPECT_THAT(delegate->saveFailures, IsEmpty());
    EXPECT_EQ(diary.back(), "reset " + kApp);
}

TEST_F(KVSessionManagerStopTest, SessionWithoutAClientIsStoppedAllTheSame) {
    const auto session = recording(kApp);
    session->client = nullptr;
    manager.stopRecordingSession(session, 0, 0, noteOutcome());
    session->completeFinish(kMovie, std::nullopt);
    EXPECT_EQ(diary.back(), "reset " + kApp);
}

TEST_F(KVSessionManagerStopTest, WithoutADelegateTheHandlerIsStillCalled) {
    const auto session = recording(kApp);
    delegate.reset();
    manager.stopRecordingSession(session, 0, 0, noteOutcome());
    session->completeFinish(std::nullopt, kFailure);
    EXPECT_THAT(diary, ElementsAre(kApp + ": finishSessionWithStartClipDuration", "handler (none, -7)",
                                   kApp + "'s client: updateScreenRecordingState"));
}

TEST_F(KVSessionManagerStopTest, DiscardOutlivesTheDelegate) {
    const auto session = recording(kApp);
    manager.stopRecordingSession(session, 0, 0, nullptr);
    delegate.reset();
    session->completeCleanup();
    EXPECT_THAT(session->client->messages(), ElementsAre("updateScreenRecordingState"));
}

TEST_F(KVSessionManagerStopTest, StopDoesNotRemoveTheSession) {
    const auto session = recording(kApp);
    manager.stopRecordingSession(session, 0, 0, nullptr);
    session->completeCleanup();
    EXPECT_EQ(manager.getRecordingSessionWithBundleIdentifier(kApp), session);
}

TEST_F(KVSessionManagerStopTest, SystemStopWithoutASystemRecordingIsNothing) {
    manager.stopSystemRecordingWithError(kFailure);
    idle(kShell);
    recording(kApp);
    manager.stopSystemRecordingWithError(kFailure);
    EXPECT_THAT(diary, IsEmpty());
}

TEST_F(KVSessionManagerStopTest, SystemStopSavesTheMovieAndTellsTheClientTheGivenError) {
    const auto system = recording(kShell);
    manager.stopSystemRecordingWithError(kFailure);
    EXPECT_THAT(system->clips, ElementsAre(test::FakeRecordingSession::Clip{0, 0}));
    diary.clear();
    system->completeFinish(kMovie, std::nullopt);
    EXPECT_THAT(diary,
                ElementsAre("save file:///store//movie.mp4", kShell + "'s client: recordingDidStopWithError",
                            kShell + "'s client: updateScreenRecordingState", "reset " + kShell));
    EXPECT_THAT(system->client->stops.copy(),
                ElementsAre(test::FakeClientProxy::Stop{kFailure, std::nullopt}));
}

TEST_F(KVSessionManagerStopTest, SystemStopWithoutAnErrorTellsTheClientNone) {
    const auto system = recording(kShell);
    manager.stopSystemRecordingWithError(std::nullopt);
    system->completeFinish(std::nullopt, kFailure);
    EXPECT_EQ(diary[2], "save nothing");
    EXPECT_THAT(system->client->stops.copy(),
                ElementsAre(test::FakeClientProxy::Stop{std::nullopt, std::nullopt}));
}

TEST_F(KVSessionManagerStopTest, SystemStopSavesNothingOfABroadcast) {
    const auto system = recording(kShell);
    system->broadcasting = true;
    manager.stopSystemRecordingWithError(kFailure);
    system->broadcasting = false;  // what counts is what it was when it was stopped
    system->completeFinish(kMovie, std::nullopt);
    EXPECT_THAT(delegate->saveCompletions, IsEmpty());
    EXPECT_EQ(system->client->stops.copy().size(), 1U);
}

TEST_F(KVSessionManagerStopTest, EverySaveIsLoggedWithItsCode) {
    const auto system = recording(kShell);
    manager.stopSystemRecordingWithError(std::nullopt);
    system->completeFinish(kMovie, std::nullopt);
    saveEndsWith(std::nullopt);
    EXPECT_TRUE(log.contains("error saving file with code: 0"));
    saveEndsWith(kFailure);
    EXPECT_TRUE(log.contains("error saving file with code: -7"));
}

TEST_F(KVSessionManagerStopTest, CurrentStopDiscardsInAppRecordingsAsInterrupted) {
    const auto app = recording(kApp);
    idle("com.example.idle");
    manager.stopCurrentRecordingSessionWithHandler(noteOutcome());
    EXPECT_THAT(app->requests, ElementsAre("finishAndCleanupSessionFiles"));
    app->completeCleanup();
    const auto stops = app->client->stops.copy();
    ASSERT_EQ(stops.size(), 1U);
    EXPECT_EQ(stops[0].error->code(), -5806);
    EXPECT_EQ(stops[0].error->localizedDescription(), "INTERRUPTED");
    EXPECT_EQ(stops[0].movieURL, std::nullopt);
    EXPECT_THAT(app->client->messages(), ElementsAre("recordingDidStopWithError"));
}

TEST_F(KVSessionManagerStopTest, CurrentStopWithoutASystemRecordingAnswersAtOnce) {
    idle(kShell);
    const auto app = recording(kApp);
    manager.stopCurrentRecordingSessionWithHandler(noteOutcome());
    EXPECT_NE(app->cleanup, nullptr);  // the discard still goes on
    EXPECT_THAT(diary, ElementsAre(kApp + ": finishAndCleanupSessionFiles", "handler (none, none)"));
}

TEST_F(KVSessionManagerStopTest, CurrentStopForwardsTheSystemRecordingsOutcome) {
    const auto system = recording(kShell);
    manager.stopCurrentRecordingSessionWithHandler(noteOutcome());
    EXPECT_THAT(system->clips, ElementsAre(test::FakeRecordingSession::Clip{0, 0}));
    EXPECT_THAT(diary, ElementsAre("prepare " + kShell, kShell + ": finishSessionWithStartClipDuration"));
    system->completeFinish(kMovie, kFailure);
    EXPECT_EQ(diary[2], "handler (file:///store//movie.mp4, -7)");
}

TEST_F(KVSessionManagerStopTest, CurrentStopNeedsNoHandler) {
    manager.stopCurrentRecordingSessionWithHandler(nullptr);
    const auto system = recording(kShell);
    manager.stopCurrentRecordingSessionWithHandler(nullptr);
    EXPECT_THAT(system->requests, ElementsAre("finishSessionWithStartClipDuration"));  // kept, not discarded
    system->completeFinish(kMovie, std::nullopt);
    EXPECT_EQ(diary.back(), "reset " + kShell);
}

TEST_F(KVSessionManagerStopTest, MultitaskingFinishesInAppRecordingsAndLeavesTheSystemOne) {
    const auto app = recording(kApp);
    const auto system = recording(kShell);
    manager.stopInAppRecordingSessionsBecauseOfMultitasking();
    EXPECT_THAT(system->requests, IsEmpty());
    EXPECT_THAT(diary, ElementsAre(kApp + ": finishSession"));
    app->completeFinish(kMovie, kFailure);
    EXPECT_EQ(diary.back(), "stopped " + kApp);
    ASSERT_EQ(delegate->stopErrors.size(), 1U);
    EXPECT_EQ(delegate->stopErrors[0]->code(), -5807);
    EXPECT_EQ(delegate->stopErrors[0]->localizedDescription(), "CONTENT_RESIZE");
    EXPECT_EQ(delegate->stopMovies[0], kMovie);
}

TEST_F(KVSessionManagerStopTest, InterruptionFinishesEveryOtherRecording) {
    const auto starting = recording(kApp);
    const auto other = recording("com.example.b");
    const auto system = recording(kShell);
    log.clear();
    manager.interruptOtherRecordingSessionAgainstSession(starting);
    EXPECT_THAT(log.texts(), ElementsAre("KVRecordingManager:interruptRecordingSessions"));
    EXPECT_THAT(starting->requests, IsEmpty());
    EXPECT_THAT(system->requests, ElementsAre("finishSession"));
    diary.clear();
    other->completeFinish(kMovie, kFailure);
    EXPECT_THAT(diary, ElementsAre("com.example.b's client: recordingDidStopWithError",
                                   "com.example.b: setInterruptedMovieURL", "reset com.example.b"));
    EXPECT_EQ(log.count("interrupted session"), 1U);
    EXPECT_EQ(other->interruptedMovie, kMovie);
    EXPECT_THAT(other->client->stops.copy(), ElementsAre(test::FakeClientProxy::Stop{kFailure, kMovie}));
}

TEST_F(KVSessionManagerStopTest, InterruptionAgainstASessionThatIsNotActiveFinishesEveryActiveOne) {
    const auto starting = idle("com.example.new");
    const auto app = recording(kApp);
    const auto system = recording(kShell);
    manager.interruptOtherRecordingSessionAgainstSession(starting);
    EXPECT_THAT(app->requests, ElementsAre("finishSession"));
    EXPECT_THAT(system->requests, ElementsAre("finishSession"));
    EXPECT_THAT(starting->requests, IsEmpty());
}

TEST_F(KVSessionManagerStopTest, InterruptionAgainstNoSessionFinishesEveryActiveOne) {
    const auto app = recording(kApp);
    manager.interruptOtherRecordingSessionAgainstSession(nullptr);
    EXPECT_THAT(app->requests, ElementsAre("finishSession"));
}

TEST_F(KVSessionManagerStopTest, SessionsAreVisitedInTheOrderOfTheirIdentifiers) {
    std::vector<std::string> expected;
    for (const char* name : {"d", "b", "h", "a", "f", "c", "g", "e"})
        recording(name);
    for (const char* name : {"a", "b", "c", "d", "e", "f", "g", "h"})
        expected.push_back(std::string(name) + ": finishSession");
    manager.stopInAppRecordingSessionsBecauseOfMultitasking();
    EXPECT_EQ(diary, expected);
}

TEST_F(KVSessionManagerStopTest, RestrictionStopsEveryRecordingAsDormant) {
    const auto app = recording(kApp);
    const auto system = recording(kShell);
    idle("com.example.idle");
    manager.profileConnectionDidReceiveEffectiveSettingsChangedNotification();
    EXPECT_THAT(app->clips, ElementsAre(test::FakeRecordingSession::Clip{0, 0}));
    EXPECT_THAT(system->clips, ElementsAre(test::FakeRecordingSession::Clip{0, 0}));
    diary.clear();
    app->completeFinish(kMovie, std::nullopt);
    EXPECT_THAT(diary, ElementsAre(kApp + "'s client: recordingLockInterrupted",
                                   kApp + "'s client: updateScreenRecordingState", "reset " + kApp));
    const auto errors = app->client->lockInterruptions.copy();
    ASSERT_EQ(errors.size(), 1U);
    EXPECT_EQ(errors[0].code(), -5809);
    EXPECT_EQ(errors[0].userInfo(), (Dictionary{{std::string(kLocalizedDescriptionKey), "SYSTEM_DORMANCY"}}));
}

TEST_F(KVSessionManagerStopTest, RestrictionSavesTheSystemRecordingsMovie) {
    const auto system = recording(kShell);
    manager.profileConnectionDidReceiveEffectiveSettingsChangedNotification();
    diary.clear();
    system->completeFinish(kMovie, std::nullopt);
    EXPECT_THAT(diary,
                ElementsAre("save file:///store//movie.mp4", kShell + "'s client: recordingLockInterrupted",
                            kShell + "'s client: updateScreenRecordingState", "reset " + kShell));
    saveEndsWith(kFailure);
    EXPECT_TRUE(log.contains("error saving file with code: -7"));
}

TEST_F(KVSessionManagerStopTest, DisconnectDiscardsAnInAppRecordingAndForgetsTheSession) {
    const auto app = recording(kApp);
    log.clear();
    manager.applicationDisconnectedWithBundleID(kApp, 42);
    EXPECT_THAT(log.texts(), ElementsAre("KVRecordingManager: applicationDisconnected",
                                         "recording stopped without handler!"));
    EXPECT_THAT(diary, ElementsAre("prepare " + kApp, kApp + ": finishAndCleanupSessionFiles"));
    EXPECT_EQ(manager.getRecordingSessionWithBundleIdentifier(kApp), nullptr);
    EXPECT_THAT(app->client->resetProcesses.copy(), IsEmpty());
}

TEST_F(KVSessionManagerStopTest, DisconnectFinishesAnInAppBroadcast) {
    const auto app = recording(kApp);
    app->broadcasting = true;
    manager.applicationDisconnectedWithBundleID(kApp, 42);
    EXPECT_THAT(app->clips, ElementsAre(test::FakeRecordingSession::Clip{0, 0}));
    EXPECT_EQ(manager.getRecordingSessionWithBundleIdentifier(kApp), nullptr);
}

TEST_F(KVSessionManagerStopTest, DisconnectOfAnUnknownBundleEndsAfterThePreparation) {
    recording(kShell);
    manager.applicationDisconnectedWithBundleID("com.example.unknown", 42);
    EXPECT_THAT(diary, ElementsAre("prepare nothing"));
}

TEST_F(KVSessionManagerStopTest, DisconnectOfAnEligibleBundleNeverStopsTheSystemSession) {
    const auto system = recording(kShell);
    for (const std::string& bundleID : {kShell, kPicker})
        manager.applicationDisconnectedWithBundleID(bundleID, 42);
    EXPECT_THAT(system->requests, IsEmpty());
    EXPECT_TRUE(system->recording);
    EXPECT_THAT(system->client->resetProcesses.copy(), ElementsAre(42, 42));
    EXPECT_EQ(manager.getSystemRecordingSession(), system);
    EXPECT_EQ(log.count("KVRecordingManager: applicationDisconnected"), 2U);
}

TEST_F(KVSessionManagerStopTest, DisconnectOfAnEligibleBundleWithoutASystemSessionIsHarmless) {
    manager.applicationDisconnectedWithBundleID(kPicker, 42);
    EXPECT_EQ(manager.getSystemRecordingSession(), nullptr);
    EXPECT_THAT(createdSessions, IsEmpty());
}

TEST_F(KVSessionManagerStopTest, NoticesReachARecordingSystemSession) {
    const auto system = recording(kShell);
    const auto app = recording(kApp);
    manager.notifySystemRecordingMayBeStopped();
    manager.notifySystemRecordingResumed();
    EXPECT_THAT(system->requests, ElementsAre("notifyRecordingMayBeStopped", "notifyRecordingResumed"));
    EXPECT_THAT(app->requests, IsEmpty());
}

TEST_F(KVSessionManagerStopTest, NoticesWithoutASystemRecordingAreNothing) {
    manager.notifySystemRecordingMayBeStopped();
    manager.notifySystemRecordingResumed();
    const auto system = idle(kShell);
    manager.notifySystemRecordingMayBeStopped();
    manager.notifySystemRecordingResumed();
    EXPECT_THAT(system->requests, IsEmpty());
}

TEST(KVClientProxyBaseTest, ProxyOfASingleClientHasNothingToReset) {
    test::FakeClientProxy proxy;
    proxy.KVClientProxyBase::resetConnectionWithProcessIdentifier(42);
    EXPECT_THAT(proxy.messages(), IsEmpty());
}

}  // namespace
}  // namespace kelvo
