#pragma once

#include "ManagerFixture.h"

#include <map>
#include <vector>

namespace kelvo::test {

inline constexpr const char* kUpdate = "updateScreenRecordingState";

/// What a start was answered with.
struct Answer {
    std::int64_t code;
    bool microphone;
    bool camera;
    friend bool operator==(const Answer&, const Answer&) = default;
};

/// Starts by the application "com.example.app", process 10, and by the system's shell, process 11.
class ManagerStartFixture : public ManagerFixture {
  protected:
    ManagerStartFixture() {
        createManager();
        addApplication(10, "com.example.app", Dictionary());
        addApplication(11, "com.quillon.plinth", {{"com.quillon.private.kelvo-kit", true}});
        device.applications->change({kApplicationStateForeground, 10, true, "com.example.app"});
        device.renderServer->setProcessOfContext(7, 10);
        device.renderServer->setProcessOfContext(8, 11);
        device.setLayout({1});
        application = session("com.example.app");
        application->client->process = 10;
        system = session("com.quillon.plinth");
        callFrom(10);
    }

    void addApplication(std::int32_t process, const std::string& bundle, const Dictionary& entitlements) {
        SimulatedBundleContent content;
        content.bundleIdentifier = bundle;
        device.bundles->addBundle("/Applications/" + bundle, content);
        device.bundles->addProcess(process, "/Applications/" + bundle + "/program");
        connections[process] = std::make_shared<SimulatedConnection>(process, entitlements);
    }
    void callFrom(std::int32_t process) { device.ipc->setCurrentConnection(connections[process]); }

    KVDaemonProtocol::StartHandler handler() {
        return [this](const OptionalError& error, bool withMicrophone, bool withCamera) {
            lastError = error;
            answers.push_back({error ? error->code() : 0, withMicrophone, withCamera});
        };
    }
    void request(bool systemRecording, const KVDaemonProtocol::StartHandler& answered) {
        manager->startRecordingWindowLayerContextIDs(contexts, {108, 192}, microphone, camera, broadcast,
                                                     systemRecording, capture, endpoint, answered);
    }
    void startInApp() { request(false, handler()); }
    /// On the main queue, where the status bar lives.
    void startSystem(const KVDaemonProtocol::StartHandler& answered) {
        callFrom(11);
        device.mainQueue->async([&] { request(true, answered); });
        device.settle();
    }
    void startSystem() { startSystem(handler()); }
    void accept() { device.answerAlert(SystemAlertResponse::alternateButton); }

    /// The client was refused with `code`, saw (or did not see) its state change, and nothing was started.
    void expectRefusal(const FakeRecordingSession& session, std::int64_t code, bool isUpdated) {
        EXPECT_THAT(answers, testing::ElementsAre(Answer{code, false, false}));
        EXPECT_EQ(session.client->messages().size(), isUpdated ? 1U : 0U);
        if (isUpdated) {
            EXPECT_EQ(session.client->messages().front(), kUpdate);
        }
        EXPECT_FALSE(session.recording);
        EXPECT_EQ(session.start, nullptr);
    }

    std::map<std::int32_t, IPCConnectionRef> connections;
    std::shared_ptr<FakeRecordingSession> application;
    std::shared_ptr<FakeRecordingSession> system;
    std::vector<std::uint32_t> contexts{7};
    bool microphone = true;
    bool camera = false;
    bool broadcast = false;
    bool capture = false;
    std::shared_ptr<IPCEndpoint> endpoint;
    std::vector<Answer> answers;
    OptionalError lastError;
};

}  // namespace kelvo::test
