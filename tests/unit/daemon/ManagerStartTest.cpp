#include "ManagerStartFixture.h"

#include <thread>

namespace kelvo {
namespace {

using test::Answer;
using test::kUpdate;
using testing::ElementsAre;
using testing::IsEmpty;

using ManagerStartTest = test::ManagerStartFixture;

TEST_F(ManagerStartTest, InAppRecordingIsConfiguredInOrderAndStarted) {
    accept();
    startInApp();
    EXPECT_THAT(application->requests,
                ElementsAre("disableBroadcast", "setBroadcasting", "setSystemRecording", "setContextIDs",
                            "setWindowSize", "setDelegate", "setCaptureRecording",
                            "setFrontmostPIDForAudioTap", "startSession"));
    EXPECT_TRUE(application->recording);
    EXPECT_FALSE(application->systemRecording || application->broadcasting || application->capturing);
    EXPECT_TRUE(application->microphone);
    EXPECT_THAT(application->contextIDs, ElementsAre(7U));
    EXPECT_EQ(application->windowSize, (Size{108, 192}));
    EXPECT_EQ(application->delegate.lock(), manager);
    EXPECT_EQ(application->tappedProcess, 10);
    EXPECT_THAT(answers, IsEmpty()) << "capturing has not begun";
    application->completeStart();
    EXPECT_THAT(answers, ElementsAre(Answer{0, true, false}));
    EXPECT_THAT(application->client->messages(), IsEmpty());
    EXPECT_EQ(manager->statusBarAssertion()->processIdentifier(), 0);
    device.applications->change({kApplicationStateBackground, 10, false, "com.example.app"});
    device.settle();
    EXPECT_EQ(application->requests.back(), "clientApplicationDidEnterBackground");
    for (const char* text : {"starting...", "broadcast disabled", "recording session started",
                             "KVRecordingManager:startRecordingWindowLayerContextID:windowSize:"
                             "microphoneEnabled:streaming:withHandler:"}) {
        EXPECT_EQ(log.count(text), 1U) << text;
    }
}

TEST_F(ManagerStartTest, CaptureIsHandedOn) {
    capture = true;
    accept();
    startInApp();
    EXPECT_TRUE(application->capturing);
}

TEST_F(ManagerStartTest, StartWithoutAHandlerStarts) {
    accept();
    request(false, nullptr);
    application->completeStart();
    EXPECT_TRUE(application->recording);
}

TEST_F(ManagerStartTest, SystemRecordingTapsTheFrontmostApplicationAndShowsItself) {
    manager->currentExtensionDisplayName().set("Service");
    startSystem();
    EXPECT_THAT(device.alerts->shownAlerts(), IsEmpty());
    EXPECT_TRUE(system->recording && system->systemRecording && system->microphone);
    EXPECT_EQ(system->tappedProcess, 10);
    const auto& bar = *manager->statusBarAssertion();
    EXPECT_EQ(bar.processIdentifier(), SimulatedDevice::kProcessIdentifier);
    EXPECT_EQ(bar.delegate(), manager);
    EXPECT_EQ(bar.assertionDelegate(), manager);
    EXPECT_EQ(bar.broadcastServiceName(), "Service");
    EXPECT_FALSE(bar.broadcasting() || bar.isPaused());
    system->completeStart();
    EXPECT_THAT(answers, ElementsAre(Answer{0, true, false}));
    EXPECT_THAT(system->client->messages(), ElementsAre(kUpdate));
    device.applications->change({kApplicationStateForeground, 10, true, "com.example.app"});
    device.settle();
    EXPECT_EQ(system->requests.back(), "frontmostApplicationDidChange");
}

TEST_F(ManagerStartTest, StatusBarIsShownOnTheMainQueue) {
    callFrom(11);
    std::atomic<bool> isDone = false;
    std::thread requests([&] {
        request(true, nullptr);
        isDone = true;
    });
    while (!isDone)
        device.mainQueue->runUntilIdle();
    requests.join();
    EXPECT_EQ(manager->statusBarAssertion()->processIdentifier(), SimulatedDevice::kProcessIdentifier);
}

TEST_F(ManagerStartTest, PresentPreferenceHidesTheStatusBarOnInternalBuildsOnly) {
    device.preferences->set("KVHideStatusBar", false);
    startSystem();
    EXPECT_NE(manager->statusBarAssertion()->processIdentifier(), 0) << "not an internal build";
    system->recording = false;
    manager->statusBarAssertion()->showDoubleHeightStatusBarWithPid(0);
    device.device->setInternalBuild(true);
    startSystem();
    EXPECT_EQ(manager->statusBarAssertion()->processIdentifier(), 0);
    EXPECT_EQ(log.count("KVRecordingManager: hideStatusBar=1"), 1U);
}

TEST_F(ManagerStartTest, PreferenceOfTheStatusBarIsLookedAtForApplicationsToo) {
    accept();
    startInApp();
    EXPECT_FALSE(log.contains("KVRecordingManager: hideStatusBar=0")) << "not an internal build";
    application->recording = false;
    device.device->setInternalBuild(true);
    startInApp();
    EXPECT_EQ(log.count("KVRecordingManager: hideStatusBar=0"), 1U);
    EXPECT_EQ(manager->statusBarAssertion()->processIdentifier(), 0) << "an application shows none";
}

TEST_F(ManagerStartTest, RepeatedStartOfTheSystemRecordingEndsTheFirstBeforeTheSecond) {
    system->recording = true;
    system->systemRecording = true;
    startSystem();
    EXPECT_EQ(system->start, nullptr);
    system->recording = true;  // as if the caller had got it going again meanwhile
    manager->setMicrophoneRecording(true);
    system->completeFinish(std::nullopt, std::nullopt);
    EXPECT_THAT(answers, ElementsAre(Answer{0, true, false}));
    EXPECT_EQ(system->client->messages().front(), kUpdate);
    EXPECT_EQ(system->start, nullptr) << "nothing is changed";
}

TEST_F(ManagerStartTest, RepeatedStartOfAnApplicationThrowsTheFirstRecordingAwayAndBeginsAnother) {
    accept();
    startInApp();
    application->completeStart();
    application->requests.clear();
    startInApp();
    EXPECT_EQ(application->requests.front(), "finishAndCleanupSessionFiles");
    EXPECT_EQ(application->requests.back(), "startSession");
    EXPECT_TRUE(application->recording);
    application->completeCleanup();
    EXPECT_THAT(stopCodes(*application), ElementsAre(-5806));
    EXPECT_FALSE(application->client->stops.copy().front().movieURL);
    EXPECT_EQ(answers.size(), 1U) << "capturing has not begun again";
    application->completeStart();
    EXPECT_THAT(answers, ElementsAre(Answer{0, true, false}, Answer{0, true, false}));
    EXPECT_TRUE(application->recording);
    EXPECT_EQ(device.alerts->shownAlerts().size(), 1U) << "exempt by now";
}

TEST_F(ManagerStartTest, MicrophoneThatTheUserRefusesIsNotRecorded) {
    device.answerAlert(SystemAlertResponse::otherButton);
    startInApp();
    EXPECT_FALSE(application->microphone);
    application->completeStart();
    EXPECT_THAT(answers, ElementsAre(Answer{0, false, false}));
}

TEST_F(ManagerStartTest, PresentPreferenceSuppressesTheAlertOnInternalBuildsOnly) {
    device.preferences->set("KVSuppressAlert", false);
    device.answerAlert(SystemAlertResponse::defaultButton);
    startInApp();
    EXPECT_EQ(device.alerts->shownAlerts().size(), 1U) << "not an internal build";
    device.device->setInternalBuild(true);
    startInApp();
    EXPECT_EQ(device.alerts->shownAlerts().size(), 1U);
    EXPECT_TRUE(application->recording && application->microphone);
    EXPECT_TRUE(log.contains("KVRecordingManager: suppressAlert=1"));
}

TEST_F(ManagerStartTest, InternalBuildWithoutThePreferenceAsks) {
    device.device->setInternalBuild(true);
    accept();
    startInApp();
    EXPECT_EQ(device.alerts->shownAlerts().size(), 1U);
    EXPECT_TRUE(log.contains("KVRecordingManager: suppressAlert=0"));
}

TEST_F(ManagerStartTest, LayoutIsWatchedFromTheFirstStartOnce) {
    accept();
    startInApp();
    EXPECT_EQ(device.displayLayout->observerCount(), 1U);
    application->recording = false;
    startInApp();
    EXPECT_EQ(device.displayLayout->monitorCount(), 1);
}

/// The monitor is made, and watched, once in the daemon's life; the end of a recording ends the watch.
TEST_F(ManagerStartTest, LayoutIsNotWatchedAgainAfterAStop) {
    accept();
    startInApp();
    application->completeStart();
    manager->stopRecordingWithHandler([](const auto&, const auto&) {});
    application->completeFinish(std::nullopt, std::nullopt);
    EXPECT_EQ(device.displayLayout->observerCount(), 0U);
    startInApp();
    EXPECT_TRUE(application->recording);
    EXPECT_EQ(device.displayLayout->observerCount(), 0U);
    EXPECT_EQ(device.displayLayout->monitorCount(), 1);
}

TEST_F(ManagerStartTest, BroadcastIsEnabledWithWhatTheSetUpFound) {
    broadcast = true;
    const auto configuration = std::make_shared<KVBroadcastConfiguration>();
    endpoint = std::make_shared<SimulatedEndpoint>(std::weak_ptr<SimulatedListener>());
    application->extension = Dictionary{
        {"KVBroadcastInfoExtensionKey", "extension"},
        {"KVBroadcastInfoExtensionProcessModeKey", 1},
        {"KVBroadcastInfoExtensionUserInfoKey", Dictionary{{"k", 1}}},
        {"KVBroadcastInfoExtensionConfigurationKey", std::shared_ptr<ObjectHandle>(configuration)}};
    accept();
    startInApp();
    EXPECT_TRUE(application->recording && application->broadcasting);
    EXPECT_EQ(application->broadcastConfiguration, configuration);
    EXPECT_EQ(application->enabledExtension, Value("extension"));
    EXPECT_EQ(application->broadcastProcessMode, BroadcastProcessMode::sampleBuffers);
    EXPECT_EQ(application->broadcastUserInfo, (Dictionary{{"k", 1}}));
    EXPECT_EQ(application->listenerEndpoint, endpoint);
    EXPECT_TRUE(log.contains("broadcast requested"));
    EXPECT_TRUE(log.contains("found broadcast info, enabling for session"));
}

TEST_F(ManagerStartTest, OtherRecordingsAreInterrupted) {
    const auto other = session("com.example.other");
    device.alerts->answer(SystemAlertResponse::alternateButton);
    application->onRequest = [&](const std::string& name) {
        if (name == "setBroadcasting") other->recording = true;
    };
    startInApp();
    EXPECT_THAT(other->requests, ElementsAre("finishSession"));
    application->onRequest = nullptr;
}

TEST_F(ManagerStartTest, CurrentRecordingIsStoppedFirst) {
    const auto other = recordingSession("com.example.other");
    accept();
    startInApp();
    EXPECT_THAT(other->requests, ElementsAre("finishAndCleanupSessionFiles"));
    EXPECT_TRUE(application->recording);
}

struct SoundCase {
    const char* name;
    std::optional<bool> shutterClick;
    bool screenReader;
    bool isHeard;
};

class ManagerSoundTest : public ManagerStartTest, public testing::WithParamInterface<SoundCase> {};

TEST_P(ManagerSoundTest, SystemRecordingIsHeardWhereItMustBe) {
    device.device->setRegionalBehaviorShutterClick(GetParam().shutterClick);
    device.accessibility->setScreenReaderRunning(GetParam().screenReader);
    startSystem();
    system->completeStart();
    EXPECT_EQ(device.sounds->played().size(), GetParam().isHeard ? 1U : 0U);
    manager->prepareForStoppingSession(system);
    if (GetParam().isHeard) {
        EXPECT_THAT(device.sounds->played(), ElementsAre(1117U, 1118U));
    }
    system->recording = false;
    callFrom(10);
    accept();
    startInApp();
    application->completeStart();
    EXPECT_EQ(device.sounds->played().size(), GetParam().isHeard ? 2U : 0U) << "applications make none";
}

INSTANTIATE_TEST_SUITE_P(Reasons, ManagerSoundTest,
                         testing::Values(SoundCase{"Nothing", std::nullopt, false, false},
                                         SoundCase{"RegionSaysNo", false, false, false},
                                         SoundCase{"RegionSaysYes", true, false, true},
                                         SoundCase{"ScreenReader", std::nullopt, true, true}),
                         [](const auto& test) { return test.param.name; });

}  // namespace
}  // namespace kelvo
