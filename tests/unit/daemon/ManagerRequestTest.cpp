#include "ManagerFixture.h"
#include "ipc/KVClientProxy.h"
#include "ipc/KVMultipleClientProxy.h"

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

/// Requests as they come from the application "com.example.app", process 10.
class ManagerRequestTest : public test::ManagerFixture {
  protected:
    ManagerRequestTest() {
        createManager();
        SimulatedBundleContent content;
        content.bundleIdentifier = "com.example.app";
        device.bundles->addBundle("/Applications/App", content);
        device.bundles->addProcess(10, "/Applications/App/program");
        device.ipc->setCurrentConnection(connection);
    }

    const std::shared_ptr<SimulatedConnection> connection =
        std::make_shared<SimulatedConnection>(10, Dictionary());
};

TEST_F(ManagerRequestTest, AcceptedClientBecomesItsSessionsClient) {
    manager->connectionManagerDidAcceptNewConnection(connection, "com.example.app");
    const auto proxy = std::dynamic_pointer_cast<KVClientProxy>(session("com.example.app")->clientProxy());
    ASSERT_NE(proxy, nullptr);
    EXPECT_EQ(proxy->connection(), connection);
}

TEST_F(ManagerRequestTest, PrivilegedClientBecomesOneOfTheSystemSessions) {
    const auto shell =
        std::make_shared<SimulatedConnection>(11, Dictionary{{"com.quillon.private.kelvo-kit", true}});
    manager->connectionManagerDidAcceptNewConnection(shell, "com.quillon.plinth");
    EXPECT_EQ(session("com.quillon.plinth")->clientProxy(), KVMultipleClientProxy::clientProxy());
}

TEST_F(ManagerRequestTest, ClientWithoutABundleStaysConnectedWithoutASession) {
    manager->connectionManagerDidAcceptNewConnection(connection, std::nullopt);
    EXPECT_FALSE(connection->isOver());
}

TEST_F(ManagerRequestTest, DisconnectedClientsRecordingIsThrownAway) {
    const auto recording = recordingSession("com.example.app");
    manager->applicationDisconnectedWithBundleID("com.example.app", 10);
    EXPECT_TRUE(log.contains("KVRecordingManager: applicationDisconnected"));
    EXPECT_THAT(recording->requests, ElementsAre("finishAndCleanupSessionFiles"));
    EXPECT_EQ(manager->sessionManager()->getRecordingSessionWithBundleIdentifier("com.example.app"), nullptr);
}

TEST_F(ManagerRequestTest, DisconnectedClientWithoutABundleStopsNothing) {
    const auto recording = recordingSession("com.example.app");
    manager->applicationDisconnectedWithBundleID(std::nullopt, 10);
    EXPECT_THAT(recording->requests, IsEmpty());
}

TEST_F(ManagerRequestTest, WhatIsNotOfferedYetIsAnsweredOrLogged) {
    std::vector<std::int64_t> codes;
    manager->setupBroadcastWithHostBundleID("", "", {}, {},
                                            [&](const OptionalError& e) { codes.push_back(e->code()); });
    manager->getSystemBroadcastExtensionInfo([&](const auto& extensions, const OptionalError& e) {
        EXPECT_THAT(extensions, IsEmpty());
        codes.push_back(e->code());
    });
    EXPECT_THAT(codes, ElementsAre(-5800, -5800));
    manager->setBroadcastURL(URL("x"));
    manager->reportCameraUsage(1);
    for (const char* request : {"setBroadcastURL", "reportCameraUsage"}) {
        EXPECT_EQ(log.count("KVRecordingManager: " + std::string(request) + " is not offered yet"), 1U);
    }
}

TEST_F(ManagerRequestTest, BroadcastImagesAreAbsentBeforeASetUpAndThenTheStoredOnes) {
    std::vector<std::optional<Bytes>> images;
    const auto answered = [&](const auto& host, const auto& extension) { images = {host, extension}; };
    manager->getCurrentBroadcastImages(answered);
    EXPECT_THAT(images, ElementsAre(std::nullopt, std::nullopt));
    manager->currentHostAppImage().set(Bytes(1));
    manager->currentExtensionAppImage().set(Bytes(2));
    manager->getCurrentBroadcastImages(answered);
    EXPECT_THAT(images, ElementsAre(Bytes(1), Bytes(2)));
}

TEST_F(ManagerRequestTest, StopFinishesTheCallersRecording) {
    const auto recording = recordingSession("com.example.app");
    std::vector<std::optional<URL>> movies;
    const auto answered = [&](const std::optional<URL>& movieURL, const auto&) {
        movies.push_back(movieURL);
    };
    manager->stopRecordingWithHandler(answered);
    recording->completeFinish(URL("file:///m"), std::nullopt);
    EXPECT_THAT(movies, ElementsAre(URL("file:///m")));
    EXPECT_THAT(recording->clips, ElementsAre(test::FakeRecordingSession::Clip{0, 0})) << "nothing is cut";
    EXPECT_TRUE(log.contains("KVRecordingManager: stopRecordingWithHandler:"));
    EXPECT_TRUE(log.contains("KVRecordingManager: stopRecordingWithStartTimeOffset:endTimeOffset:handler:"));
}

TEST_F(ManagerRequestTest, StopHandsTheClipDurationsOn) {
    const auto recording = recordingSession("com.example.app");
    manager->stopRecordingWithStartClipDuration(1, 2, [](const auto&, const auto&) {});
    EXPECT_THAT(recording->clips, ElementsAre(test::FakeRecordingSession::Clip{1, 2}));
}

TEST_F(ManagerRequestTest, StopOfACallerWithoutASessionAnswersNothing) {
    int answers = 0;
    manager->stopRecordingWithHandler([&](const auto& movieURL, const auto& error) {
        EXPECT_FALSE(movieURL || error);
        ++answers;
    });
    EXPECT_EQ(answers, 1);
}

TEST_F(ManagerRequestTest, ResumeWithTheCallersWindowGoesOn) {
    const auto found = recordingSession("com.example.app");
    device.renderServer->setProcessOfContext(7, 10);
    manager->resumeRecordingWithWindowLayerContextID(7);
    EXPECT_THAT(found->requests, IsEmpty()) << "it is not paused";
    found->paused = true;
    manager->resumeRecordingWithWindowLayerContextID(7);
    EXPECT_THAT(found->requests, ElementsAre("resumeSession"));
    EXPECT_THAT(found->contextIDs, ElementsAre(7U));
    EXPECT_EQ(log.count("KVRecordingManager: resumeRecording"), 2U);
}

TEST_F(ManagerRequestTest, ResumeWithAForeignWindowStopsThePausedRecording) {
    const auto found = recordingSession("com.example.app");
    manager->resumeRecordingWithWindowLayerContextID(7);
    EXPECT_THAT(found->requests, IsEmpty()) << "it is not paused";
    found->paused = true;
    manager->resumeRecordingWithWindowLayerContextID(7);
    found->completeFinish(URL("file:///m"), std::nullopt);
    EXPECT_THAT(stopCodes(*found), ElementsAre(-5816));
    EXPECT_EQ(found->client->stops.copy().front().movieURL, URL("file:///m"));
}

TEST_F(ManagerRequestTest, AudioProcessIsChangedForPrivilegedClientsOnly) {
    const auto found = recordingSession("com.example.app");
    manager->updateProcessIDForAudioCaptureWithPID(5);
    EXPECT_THAT(found->requests, IsEmpty());
    device.ipc->setCurrentConnection(
        std::make_shared<SimulatedConnection>(10, Dictionary{{"com.quillon.private.kelvo-kit", true}}));
    manager->updateProcessIDForAudioCaptureWithPID(5);
    EXPECT_EQ(found->tappedProcess, 5);
    found->recording = false;
    manager->updateProcessIDForAudioCaptureWithPID(6);
    EXPECT_EQ(found->tappedProcess, 5);
    EXPECT_TRUE(log.contains("KVRecordingManager: updateProcessIDForAudioCaptureWithPID:6"));
}

TEST_F(ManagerRequestTest, ClientThatGoesIsObservedNoLonger) {
    manager->applicationStateMonitor()->addObserver(session("com.example.app"), 10);
    manager->applicationDisconnectedWithBundleID("com.example.app", 10);
    EXPECT_EQ(manager->applicationStateMonitor()->observersCount(), 0U);
}

TEST_F(ManagerRequestTest, PauseReachesOnlyARunningInAppRecording) {
    const auto idle = session("com.example.app");
    manager->pauseRecording();
    EXPECT_THAT(idle->requests, IsEmpty());
    idle->recording = true;
    idle->systemRecording = true;
    manager->pauseRecording();
    EXPECT_THAT(idle->requests, IsEmpty());
    idle->systemRecording = false;
    manager->pauseRecording();
    manager->pauseRecording();
    EXPECT_THAT(idle->requests, ElementsAre("pauseSession")) << "a paused one is not paused again";
    EXPECT_EQ(log.count("KVRecordingManager:pauseRecording"), 4U);
}

TEST_F(ManagerRequestTest, MicrophoneIsSwitchedOnlyWhileRecording) {
    const auto found = session("com.example.app");
    manager->setMicrophoneEnabled(true);
    EXPECT_FALSE(found->microphone);
    EXPECT_THAT(found->client->messages(), IsEmpty());
    found->recording = true;
    manager->setMicrophoneEnabled(true);
    EXPECT_TRUE(found->microphone);
    EXPECT_THAT(found->client->messages(), ElementsAre("updateScreenRecordingState"));
    EXPECT_EQ(log.count("KVRecordingManager: setMicrophoneEnabled:1"), 2U);
}

TEST_F(ManagerRequestTest, FlagsAreSetOnTheCallersSession) {
    manager->setHasUserConsentForCamera(true);  // without a session: nothing to set
    const auto found = session("com.example.app");
    manager->setHasUserConsentForCamera(true);
    EXPECT_TRUE(found->cameraConsent);
    manager->setHasUserConsentForMicrophone(true);
    EXPECT_TRUE(found->microphoneConsent);
    EXPECT_THAT(found->client->messages(), IsEmpty());
    manager->setMicrophoneEnabledPersistent(true);
    EXPECT_TRUE(found->microphonePersistent);
    EXPECT_THAT(found->client->messages(), ElementsAre("updateScreenRecordingState"));
}

TEST_F(ManagerRequestTest, DiscardCleansUpAndThenAnswers) {
    const auto found = session("com.example.app");
    int answers = 0;
    manager->discardRecordingWithHandler([&] { ++answers; });
    EXPECT_THAT(found->requests, ElementsAre("finishAndCleanupSessionFiles"));
    EXPECT_EQ(answers, 0);
    found->completeCleanup();
    EXPECT_EQ(answers, 1);
    EXPECT_TRUE(log.contains("KVRecordingManager: discardRecording"));
}

TEST_F(ManagerRequestTest, DiscardWhileRecordingIsNotAnswered) {
    const auto found = recordingSession("com.example.app");
    manager->discardRecordingWithHandler([] { FAIL(); });
    EXPECT_THAT(found->requests, IsEmpty());
    EXPECT_EQ(log.count(LogLevel::error, "can't discard recording while recording is in progress"), 1U);
}

TEST_F(ManagerRequestTest, StateOfACallerWithoutASessionIsNone) {
    std::optional<Dictionary> state = Dictionary();
    manager->synchronousGetCurrentState([&](const auto& answer) { state = answer; });
    EXPECT_EQ(state, std::nullopt);
}

TEST_F(ManagerRequestTest, StateHasSevenKeysInTheirOrder) {
    const auto found = recordingSession("com.example.app");
    found->microphone = true;
    found->cameraConsent = true;
    std::optional<Dictionary> state;
    manager->synchronousGetCurrentState([&](const auto& answer) { state = answer; });
    EXPECT_EQ(state, (Dictionary{{"isRecording", true},
                                 {"isBroadcasting", false},
                                 {"microphoneEnabled", true},
                                 {"isSystemRecording", false},
                                 {"hasUserConsentForMicrophone", false},
                                 {"hasUserConsentForCamera", true},
                                 {"microphoneEnabledPersistent", false}}));
}

TEST_F(ManagerRequestTest, NobodyBroadcastsWithAnExtensionWhileNoneIsLinked) {
    session("com.quillon.plinth");
    std::vector<bool> answers;
    manager->synchronousIsBroadcastingWithPreferredExtension("x",
                                                             [&](bool answer) { answers.push_back(answer); });
    EXPECT_THAT(answers, ElementsAre(false));
}

TEST_F(ManagerRequestTest, OnlyWhatLiesInTheStoreIsSavedAndDeleted) {
    device.fileSystem->addFile("/etc/passwd", 1);
    std::vector<std::int64_t> codes;
    for (const char* path : {"/etc/passwd", "/private/var/mobile/Library/KelvoKit/../../passwd"}) {
        manager->saveVideoToCameraRoll(URL::file(path),
                                       [&](const OptionalError& e) { codes.push_back(e->code()); });
    }
    manager->saveVideoToCameraRoll(URL::file("/etc/passwd"), nullptr);
    device.settle();
    EXPECT_THAT(codes, ElementsAre(-5812, -5812));
    EXPECT_TRUE(device.fileSystem->itemExists("/etc/passwd"));
    EXPECT_THAT(device.photoLibrary->items(), IsEmpty());
    EXPECT_THAT(device.alerts->shownAlerts(), IsEmpty()) << "the user has nothing to do with it";
}

TEST_F(ManagerRequestTest, ApplicationSavesItsOwnFinishedMovieAndTheShellEveryOne) {
    const URL movie = URL::file("/private/var/mobile/Library/KelvoKit/App.mp4");
    const auto isSaved = [&] {
        device.fileSystem->addFile(movie.path(), 1);
        device.media->addMovie(movie, {});
        std::atomic<bool> isAnswered = false;
        OptionalError error;
        manager->saveVideoToCameraRoll(movie, [&](const OptionalError& e) {
            error = e;
            isAnswered = true;
        });
        while (!isAnswered) {
            device.settle();
            std::this_thread::yield();
        }
        return !error;
    };
    EXPECT_FALSE(isSaved()) << "a client without a session";
    const auto found = session("com.example.app");
    EXPECT_FALSE(isSaved()) << "another application's";
    found->ownMovie = movie;
    EXPECT_TRUE(isSaved());
    found->recording = true;
    EXPECT_FALSE(isSaved()) << "it is being recorded";
    found->recording = false;
    found->ownMovie.reset();
    device.ipc->setCurrentConnection(
        std::make_shared<SimulatedConnection>(11, Dictionary{{"com.quillon.private.kelvo-kit", true}}));
    EXPECT_TRUE(isSaved()) << "the shell";
}

TEST_F(ManagerRequestTest, DiscardOfACallerWithoutASessionIsAnswered) {
    int answers = 0;
    manager->discardRecordingWithHandler([&] { ++answers; });
    manager->discardRecordingWithHandler(nullptr);
    EXPECT_EQ(answers, 1);
}

TEST_F(ManagerRequestTest, BroadcastThatIsResumedAsksFirst) {
    const auto found = recordingSession("com.example.app");
    found->broadcasting = true;
    found->paused = true;
    device.renderServer->setProcessOfContext(7, 10);
    manager->resumeRecordingWithWindowLayerContextID(7);
    EXPECT_TRUE(log.contains("KVRecordingManager: showResumeBroadcastAlertWithSession is not offered yet"));
    EXPECT_THAT(found->requests, ElementsAre("resumeSession"));
}

}  // namespace
}  // namespace kelvo
