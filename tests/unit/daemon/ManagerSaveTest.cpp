#include "ManagerFixture.h"

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

/// Saves of a movie that lies in the store.
class ManagerSaveTest : public test::ManagerFixture {
  protected:
    ManagerSaveTest() {
        createManager();
        device.fileSystem->addFile(kMovie, 100);
        device.media->addMovie(URL::file(kMovie), {});
    }

    void save(const std::optional<URL>& movieURL) {
        manager->saveVideoToCameraRoll(movieURL, [this](const OptionalError& error) {
            const std::int64_t code = error ? error->code() : 0;
            answers.with([&](auto& all) { all.push_back(code); });
        });
        waitForTheMix();
        device.settle();
    }
    /// The export works on a queue of its own; its completion asks for the removal, which answers.
    void waitForTheMix() {
        while (answers.copy().empty()) {
            device.settle();
            std::this_thread::yield();
        }
    }
    void waitForAlerts() {
        KVRecordingManager::kelvoAlertQueue().sync([] {});
    }
    bool exists(const std::string& path) { return device.fileSystem->itemExists(path); }

    static inline const std::string kMovie = std::string(kStore) + "/movie.mp4";
    static inline const std::string kDiagnostics =
        "<Gallery>[Gallery][com.quillon.KelvoKit]: Saved screen recording.";
    Guarded<std::vector<std::int64_t>> answers;
};

TEST_F(ManagerSaveTest, MixedMovieIsSavedAndNothingStays) {
    save(URL::file(kMovie));
    EXPECT_THAT(answers.copy(), ElementsAre(0));
    ASSERT_EQ(device.photoLibrary->items().size(), 1U);
    const auto item = device.photoLibrary->items().front();
    EXPECT_THAT(item.moviePath, testing::HasSubstr("KVKelvo_Final"));
    EXPECT_EQ(manager->photoAsset().copy(), item.asset);
    EXPECT_FALSE(exists(kMovie));
    EXPECT_FALSE(exists(item.moviePath));
    EXPECT_TRUE(
        log.contains("KVRecordingManager:saveVideoToCameraRoll: Video saved to camera roll successful"));
    EXPECT_FALSE(log.contains(kDiagnostics)) << "nobody asked for them";
    EXPECT_THAT(device.alerts->shownAlerts(), IsEmpty());
}

TEST_F(ManagerSaveTest, SaveIsToldToWhoeverFollowsThePhotoLibrary) {
    device.preferences->set("KVPhotoLibraryDiagnostics", true);
    save(URL::file(kMovie));
    EXPECT_EQ(log.count(kDiagnostics), 1U);
}

TEST_F(ManagerSaveTest, NewRecordingOfTheSameNameIsNotTakenForTheSavedOne) {
    recordingSession("app")->ownMovie = URL::file(kMovie);
    for (const int mixError : {0, ENOSPC}) {
        answers.set({});
        if (mixError != 0) device.failNext("ExportSession.export", mixError);
        save(URL::file(kMovie));
        EXPECT_THAT(answers.copy(), ElementsAre(0));
        EXPECT_TRUE(exists(kMovie));
    }
    EXPECT_EQ(device.photoLibrary->items().size(), 2U);
    EXPECT_FALSE(exists(device.photoLibrary->items().front().moviePath)) << "the mixed one goes";
}

TEST_F(ManagerSaveTest, UnmixedMovieIsSavedWhenMixingFails) {
    device.failNext("ExportSession.export", ENOSPC);
    save(URL::file(kMovie));
    EXPECT_THAT(answers.copy(), ElementsAre(0));
    ASSERT_EQ(device.photoLibrary->items().size(), 1U);
    EXPECT_EQ(device.photoLibrary->items().front().moviePath, kMovie);
    EXPECT_FALSE(exists(kMovie));
    EXPECT_EQ(log.count(LogLevel::error, "Error Mixing video Audio tracks"), 1U);
}

TEST_F(ManagerSaveTest, FailedSaveIsToldToTheUserAndTheCallerAndLeavesNothing) {
    device.failNext("PhotoLibrary.createVideoAsset", ENOSPC);
    device.answerAlert(SystemAlertResponse::defaultButton);
    save(URL::file(kMovie));
    waitForAlerts();
    EXPECT_THAT(answers.copy(), ElementsAre(ENOSPC));
    EXPECT_FALSE(exists(kMovie));
    EXPECT_THAT(device.photoLibrary->items(), IsEmpty());
    EXPECT_EQ(device.alerts->shownAlerts().size(), 1U);
    EXPECT_EQ(log.count(LogLevel::error,
                        "KVRecordingManager: showAlertForRecordingSession: user has hit okay, alert will be "
                        "dismissed"),
              1U);
}

TEST_F(ManagerSaveTest, AlertThatCannotBeShownIsLogged) {
    device.failNext("PhotoLibrary.createVideoAsset", ENOSPC);
    device.failNext("SystemAlert.createAlert", ENOSYS);
    save(URL::file(kMovie));
    waitForAlerts();
    EXPECT_EQ(log.count(LogLevel::error, "error showing broadcast stopped with error alert"), 1U);
}

TEST_F(ManagerSaveTest, FailedRemovalOfTheSavedFileIsTheAnswer) {
    device.failNext("ExportSession.export", EIO);  // leaves one file to be removed
    device.failNext("FileSystem.removeItem", EPERM);
    save(URL::file(kMovie));
    EXPECT_THAT(answers.copy(), ElementsAre(EPERM));
    EXPECT_EQ(log.count(LogLevel::error, "error removing file with code: 1"), 1U);
    EXPECT_EQ(device.photoLibrary->items().size(), 1U);
}

TEST_F(ManagerSaveTest, SaveWithoutAMovieFails) {
    device.answerAlert(SystemAlertResponse::defaultButton);
    save(std::nullopt);
    waitForAlerts();
    EXPECT_THAT(answers.copy(), ElementsAre(-5812));
    EXPECT_EQ(device.alerts->shownAlerts().size(), 1U);
}

TEST_F(ManagerSaveTest, FailureOfASessionIsShownForTheSystemRecordingAlone) {
    manager->failedToSaveRecordingForRecordingSession(session("a"), KVError("domain", -5812));
    waitForAlerts();
    EXPECT_THAT(device.alerts->shownAlerts(), IsEmpty());
    device.answerAlert(SystemAlertResponse::defaultButton);
    manager->failedToSaveRecordingForRecordingSession(recordingSystemSession(), KVError("domain", -5812));
    waitForAlerts();
    EXPECT_EQ(device.alerts->shownAlerts().size(), 1U);
    EXPECT_EQ(log.count("KVRecordingManager:saveVideoToCameraRoll: Video saved to camera roll failed"), 2U);
}

TEST_F(ManagerSaveTest, StoppedReportIsShownForTheSystemRecordingAlone) {
    const auto application = recordingSession("a");
    manager->recordingSessionStoppedWithError(application, KVError("domain", -5804));
    waitForAlerts();
    EXPECT_THAT(device.alerts->shownAlerts(), IsEmpty());
    EXPECT_THAT(stopCodes(*application), ElementsAre(-5804));
    const auto system = recordingSystemSession();
    manager->applicationStateMonitor()->addSystemObserver(system);
    manager->recordingSessionStoppedWithError(system, KVError("domain", -5804));
    EXPECT_THAT(stopCodes(*system), ElementsAre(-5804)) << "the client does not wait for the user";
    EXPECT_EQ(manager->applicationStateMonitor()->observersCount(), 0U);
    device.answerAlert(SystemAlertResponse::defaultButton);
    waitForAlerts();
    EXPECT_EQ(device.alerts->shownAlerts().size(), 1U);
}

TEST_F(ManagerSaveTest, StopBeforeAStartSavesTheMovieAsItIsAndKeepsItsFile) {
    const auto system = recordingSystemSession();
    int ends = 0;
    manager->stopCurrentRecordingSessionWithHandler([&](const OptionalError& error) {
        EXPECT_FALSE(error);
        ++ends;
    });
    EXPECT_EQ(ends, 0);
    manager->applicationStateMonitor()->addSystemObserver(system);
    system->completeFinish(URL::file(kMovie), std::nullopt);
    EXPECT_EQ(ends, 1);
    EXPECT_EQ(manager->applicationStateMonitor()->observersCount(), 0U);
    ASSERT_EQ(device.photoLibrary->items().size(), 1U);
    EXPECT_EQ(device.photoLibrary->items().front().moviePath, kMovie);
    EXPECT_TRUE(manager->photoAsset().copy());
    EXPECT_TRUE(exists(kMovie));
    EXPECT_TRUE(log.contains(
        "KVRecordingManager:stopCurrentRecordingSession: Video saved to camera roll successful"));
}

TEST_F(ManagerSaveTest, StopBeforeAStartOnlyLogsAFailedSave) {
    const auto system = recordingSystemSession();
    device.failNext("PhotoLibrary.createVideoAsset", ENOSPC);
    int ends = 0;
    manager->stopCurrentRecordingSessionWithHandler([&](const OptionalError& error) {
        EXPECT_FALSE(error);
        ++ends;
    });
    system->completeFinish(URL::file(kMovie), std::nullopt);
    waitForAlerts();
    EXPECT_EQ(ends, 1);
    EXPECT_THAT(device.alerts->shownAlerts(), IsEmpty());
    EXPECT_TRUE(
        log.contains("KVRecordingManager:stopCurrentRecordingSession: Video saved to camera roll failed"));
}

TEST_F(ManagerSaveTest, StopOfNothingSavesNothing) {
    manager->stopCurrentRecordingSessionWithHandler(nullptr);
    EXPECT_TRUE(log.contains("KVRecordingManager:stopCurrentRecordingSession:"));
    EXPECT_TRUE(log.contains("stop monitoring foreground apps"));
    EXPECT_THAT(device.photoLibrary->items(), IsEmpty());
}

TEST_F(ManagerSaveTest, WithdrawnStatusBarStopsTheSystemRecording) {
    const auto system = recordingSystemSession();
    manager->statusBarCoordinatorInvalidatedRegistrationWithError(std::nullopt);
    system->completeFinish(URL::file(kMovie), std::nullopt);
    EXPECT_THAT(stopCodes(*system), ElementsAre(-5809));
    EXPECT_TRUE(log.contains("statusBarCoordinatior:invalidatedRegistration"));
}

TEST_F(ManagerSaveTest, TimesAndServiceInformationReachTheirClients) {
    const auto system = session("com.quillon.plinth");
    system->microphone = true;
    system->paused = true;
    manager->timerDidUpdate("0:05");
    manager->broadcastSessionDidUpdateServiceInfo(system, {{"k", 1}});
    manager->broadcastSessionDidUpdateDuration(system, 5);
    EXPECT_THAT(system->client->timerTexts.copy(), ElementsAre("0:05"));
    EXPECT_THAT(system->client->serviceInfos.copy(), ElementsAre(Dictionary{{"k", 1}}));
    EXPECT_TRUE(manager->statusBarAssertion()->microphoneEnabled());
    EXPECT_TRUE(manager->statusBarAssertion()->isPaused());
}

}  // namespace
}  // namespace kelvo
