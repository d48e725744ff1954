#include "ManagerFixture.h"

#include <chrono>

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using namespace std::chrono_literals;

constexpr const char* kFramework = "/System/Library/Frameworks/KelvoKit.framework";

class ManagerConsentTest : public test::ManagerFixture {
  protected:
    ManagerConsentTest() {
        SimulatedBundleContent framework;
        auto& texts = framework.tables["en"]["Localizable"];
        for (const char* kind :
             {"ACKNOWLEDGEMENT_ALERT", "ACKNOWLEDGEMENT_CAPTURE_ALERT", "ACKNOWLEDGEMENT_BROADCAST_ALERT"}) {
            const std::string prefix = kind;
            texts[prefix + "_TITLE"] = prefix + " of %@";
            for (const char* rest :
                 {"_BODY", "_BODY_CAMERA", "_BODY_MIC", "_DECLINE_BUTTON", "_ACCEPT_BUTTON_1",
                  "_ACCEPT_BUTTON_1_CAMERA", "_ACCEPT_BUTTON_1_MICROPHONE_DISABLED", "_ACCEPT_BUTTON_2"})
                texts[prefix + rest] = prefix + rest;
        }
        device.bundles->addBundle(kFramework, framework);
        SimulatedBundleContent content;
        content.bundleIdentifier = "app";
        content.displayName = "App";
        device.bundles->addBundle("/Applications/App", content);
        createManager();
        asking = session("app");
    }

    bool ask(SystemAlertResponse response, bool isBroadcast = false) {
        device.answerAlert(response);
        return manager->showAcknowledgementAlertForSession(asking, isBroadcast);
    }
    void want(bool microphone, bool camera) {
        manager->setMicrophoneRecording(microphone);
        manager->setCameraRecording(camera);
    }
    std::set<std::string> exempt() { return manager->exemptBundleIdentifiers().copy(); }
    std::set<std::string> exemptWithMicrophone() {
        return manager->exemptWithMicRecordingEnabledBundleIdentifiers().copy();
    }

    std::shared_ptr<test::FakeRecordingSession> asking;
};

struct TextCase {
    const char* name;
    bool capture;
    bool broadcast;
    bool microphone;
    bool camera;
    std::string title;
    std::string body;
    std::string alternate;
    std::string other;
};

class ManagerConsentTextTest : public ManagerConsentTest, public testing::WithParamInterface<TextCase> {};

TEST_P(ManagerConsentTextTest, AlertSaysWhatIsRecorded) {
    const TextCase& row = GetParam();
    asking->capturing = row.capture;
    want(row.microphone, row.camera);
    ask(SystemAlertResponse::defaultButton, row.broadcast);
    const auto alerts = device.alerts->shownAlerts();
    ASSERT_EQ(alerts.size(), 1U);
    const SystemAlertContent& alert = alerts.front();
    const std::string prefix = "ACKNOWLEDGEMENT_";
    EXPECT_EQ(alert.header, prefix + row.title + " of App");
    EXPECT_EQ(alert.message, prefix + row.body);
    EXPECT_EQ(alert.defaultButton, prefix + "ALERT_DECLINE_BUTTON");
    EXPECT_EQ(alert.alternateButton, row.alternate.empty() ? "" : prefix + row.alternate);
    EXPECT_EQ(alert.otherButton, prefix + row.other);
    EXPECT_EQ(alert.localizationPath, kFramework);
    EXPECT_TRUE(log.contains("KVRecordingManager:showAcknowledgementAlert"));
}

INSTANTIATE_TEST_SUITE_P(
    Kinds, ManagerConsentTextTest,
    testing::Values(TextCase{"Plain", false, false, false, false, "ALERT", "ALERT_BODY", "",
                             "ALERT_ACCEPT_BUTTON_1_MICROPHONE_DISABLED"},
                    TextCase{"PlainWithMicrophoneSpeaksOfTheCamera", false, false, true, false, "ALERT",
                             "ALERT_BODY ACKNOWLEDGEMENT_ALERT_BODY_CAMERA", "ALERT_ACCEPT_BUTTON_1",
                             "ALERT_ACCEPT_BUTTON_2"},
                    TextCase{"PlainWithBoth", false, false, true, true, "ALERT",
                             "ALERT_BODY ACKNOWLEDGEMENT_ALERT_BODY_CAMERA", "ALERT_ACCEPT_BUTTON_1_CAMERA",
                             "ALERT_ACCEPT_BUTTON_2"},
                    TextCase{"Broadcast", false, true, false, false, "BROADCAST_ALERT",
                             "BROADCAST_ALERT_BODY", "",
                             "BROADCAST_ALERT_ACCEPT_BUTTON_1_MICROPHONE_DISABLED"},
                    TextCase{"BroadcastWithMicrophone", false, true, true, false, "BROADCAST_ALERT",
                             "BROADCAST_ALERT_BODY ACKNOWLEDGEMENT_BROADCAST_ALERT_BODY_MIC",
                             "BROADCAST_ALERT_ACCEPT_BUTTON_1", "BROADCAST_ALERT_ACCEPT_BUTTON_2"},
                    TextCase{"BroadcastWithCamera", false, true, false, true, "BROADCAST_ALERT",
                             "BROADCAST_ALERT_BODY ACKNOWLEDGEMENT_BROADCAST_ALERT_BODY_CAMERA",
                             "BROADCAST_ALERT_ACCEPT_BUTTON_1_CAMERA", "BROADCAST_ALERT_ACCEPT_BUTTON_2"},
                    TextCase{"Capture", true, false, false, false, "CAPTURE_ALERT", "CAPTURE_ALERT_BODY", "",
                             "ALERT_ACCEPT_BUTTON_1_MICROPHONE_DISABLED"},
                    TextCase{"BroadcastingCapture", true, true, true, false, "CAPTURE_ALERT",
                             "CAPTURE_ALERT_BODY ACKNOWLEDGEMENT_BROADCAST_ALERT_BODY_MIC",
                             "BROADCAST_ALERT_ACCEPT_BUTTON_1", "BROADCAST_ALERT_ACCEPT_BUTTON_2"}),
    [](const auto& test) { return test.param.name; });

/// What was to be recorded, the button, and what is recorded then.
struct AnswerCase {
    const char* name;
    bool microphone;
    bool camera;
    SystemAlertResponse button;
    bool isMicrophoneLeft;
    bool isCameraLeft;
    const char* logged;
};

class ManagerConsentAnswerTest : public ManagerConsentTest, public testing::WithParamInterface<AnswerCase> {};

TEST_P(ManagerConsentAnswerTest, ButtonDecidesWhatIsRecordedAndExempts) {
    const AnswerCase& row = GetParam();
    for (const bool isBroadcast : {false, true}) {
        manager->exemptBundleIdentifiers().set({});
        manager->exemptWithMicRecordingEnabledBundleIdentifiers().set({});
        asking->daemonMicrophoneConsent = !row.isMicrophoneLeft;
        want(row.microphone, row.camera);
        EXPECT_TRUE(ask(row.button, isBroadcast));
        EXPECT_EQ(manager->isMicrophoneRecording(), row.isMicrophoneLeft);
        EXPECT_EQ(manager->isCameraRecording(), row.isCameraLeft);
        EXPECT_EQ(asking->daemonMicrophoneConsent, row.isMicrophoneLeft);
        EXPECT_THAT(exempt(), ElementsAre("app"));
        EXPECT_EQ(exemptWithMicrophone().size(), row.isMicrophoneLeft ? 1U : 0U);
        EXPECT_EQ(log.count(row.logged), isBroadcast ? 2U : 1U);
    }
}

constexpr auto kFull = SystemAlertResponse::alternateButton;
constexpr auto kLess = SystemAlertResponse::otherButton;
constexpr const char* kAcknowledged = "user acknowledged recording";
constexpr const char* kWithoutCamera = "user acknowledged recording, but camera recording is disabled";
constexpr const char* kWithoutMicrophone =
    "user acknowledged recording, but microphone recording is disabled";

INSTANTIATE_TEST_SUITE_P(
    Rows, ManagerConsentAnswerTest,
    testing::Values(AnswerCase{"AllOfBoth", true, true, kFull, true, true, kAcknowledged},
                    AnswerCase{"AllOfTheCameraAlone", false, true, kFull, false, true, kAcknowledged},
                    AnswerCase{"AllOfTheMicrophoneAlone", true, false, kFull, true, false, kAcknowledged},
                    AnswerCase{"LessThanBoth", true, true, kLess, false, false, kWithoutCamera},
                    AnswerCase{"LessThanTheCameraAlone", false, true, kLess, false, false, kWithoutCamera},
                    AnswerCase{"LessThanTheMicrophoneAlone", true, false, kLess, false, false,
                               kWithoutMicrophone},
                    AnswerCase{"Neither", false, false, kLess, false, false, kWithoutMicrophone}),
    [](const auto& test) { return test.param.name; });

TEST_F(ManagerConsentTest, RefusalLeavesNothingBehind) {
    for (const auto response : {SystemAlertResponse::defaultButton, SystemAlertResponse::cancelled}) {
        for (const bool microphone : {false, true}) {
            for (const bool camera : {false, true}) {
                want(microphone, camera);
                EXPECT_FALSE(ask(response));
                EXPECT_EQ(manager->isMicrophoneRecording(), microphone);
                EXPECT_EQ(manager->isCameraRecording(), camera);
            }
        }
    }
    EXPECT_THAT(exempt(), IsEmpty());
    EXPECT_EQ(log.count("user refused recording"), 8U);
}

TEST_F(ManagerConsentTest, AlertThatCannotBeShownIsARefusal) {
    device.failNext("SystemAlert.createAlert", ENOSYS);
    EXPECT_FALSE(manager->showAcknowledgementAlertForSession(asking, false));
    EXPECT_EQ(log.count(LogLevel::error, "error showing acknowledgement alert"), 1U);
}

TEST_F(ManagerConsentTest, ExemptApplicationIsNotAskedAbout) {
    manager->updateExemptionListWithSession(asking);
    want(true, true);
    EXPECT_TRUE(manager->showAcknowledgementAlertForSession(asking, false));
    EXPECT_THAT(device.alerts->shownAlerts(), IsEmpty());
    EXPECT_TRUE(manager->isMicrophoneRecording() && manager->isCameraRecording());
}

TEST_F(ManagerConsentTest, ExemptionEndsMoreThanEightMinutesAfterTheFirstBackground) {
    want(true, false);
    ask(SystemAlertResponse::alternateButton);
    manager->recordingSessionClientDidEnterBackground(asking);
    device.advance(7min);
    manager->recordingSessionClientDidEnterForeground(asking);
    EXPECT_THAT(exempt(), ElementsAre("app"));
    manager->recordingSessionClientDidEnterBackground(asking);
    device.advance(2min);
    manager->recordingSessionClientDidEnterForeground(asking);
    EXPECT_THAT(exempt(), IsEmpty());
    EXPECT_THAT(exemptWithMicrophone(), IsEmpty());
    EXPECT_TRUE(manager->lastBackgroundDateByBundleIdentifier().copy().empty());
    EXPECT_EQ(log.count("removedExemption"), 1U);
}

TEST_F(ManagerConsentTest, ExactlyEightMinutesAreNotTooLong) {
    manager->updateExemptionListWithSession(asking);
    manager->recordingSessionClientDidEnterBackground(asking);
    device.advance(480s);
    manager->expireAcknowledgementExemptionsForBundleID("app");
    EXPECT_THAT(exempt(), ElementsAre("app"));
    device.advance(1ns);
    manager->expireAcknowledgementExemptionsForBundleID("app");
    EXPECT_THAT(exempt(), IsEmpty());
}

TEST_F(ManagerConsentTest, NewConnectionEndsAnOldExemptionOfItsOwnBundle) {
    manager->updateExemptionListWithSession(asking);
    manager->recordingSessionClientDidEnterBackground(asking);
    device.advance(481s);
    const auto connection = std::make_shared<SimulatedConnection>(10, Dictionary());
    manager->connectionManagerDidAcceptNewConnection(connection, "other");
    manager->connectionManagerDidAcceptNewConnection(connection, std::nullopt);
    EXPECT_THAT(exempt(), ElementsAre("app"));
    manager->connectionManagerDidAcceptNewConnection(connection, "app");
    EXPECT_THAT(exempt(), IsEmpty());
}

TEST_F(ManagerConsentTest, ApplicationThatIsBackHearsOfItsInterruptedMovieOnce) {
    asking->interruptedMovie = URL::file("/m.mp4");
    manager->recordingSessionClientDidEnterForeground(asking);
    EXPECT_THAT(stopCodes(*asking), IsEmpty()) << "it is not recording";
    asking->recording = true;
    manager->recordingSessionClientDidEnterForeground(asking);
    manager->recordingSessionClientDidEnterForeground(asking);
    EXPECT_THAT(stopCodes(*asking), ElementsAre(-5806));
    EXPECT_EQ(asking->client->stops.copy().front().movieURL, URL::file("/m.mp4"));
    EXPECT_EQ(log.count("current session was interrupted - notify client app of error"), 1U);
}

}  // namespace
}  // namespace kelvo
