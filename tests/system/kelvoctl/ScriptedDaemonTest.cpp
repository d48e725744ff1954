#include "KelvoctlProcess.h"
#include "ipc/KVClientProtocolTable.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "support/Eventually.h"
#include "support/FakeDaemon.h"
#include "support/TemporaryDirectory.h"

#include <csignal>
#include <filesystem>
#include <fstream>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using test::KelvoctlProcess;
using testing::ElementsAre;
using Answer = std::pair<int, std::string>;

KVError errorSaying(const std::string& text) {
    return {"domain", -5804, {{std::string(kLocalizedDescriptionKey), text}}};
}

/// A daemon that records as a test decides.
class ScriptedDaemon : public test::FakeDaemon {
  public:
    void startRecordingWindowLayerContextIDs(const std::vector<std::uint32_t>& windowLayerContextIDs,
                                             const Size& windowSize, bool microphoneEnabled,
                                             bool cameraEnabled, bool broadcast, bool systemRecording,
                                             bool captureEnabled,
                                             const std::shared_ptr<IPCEndpoint>& listenerEndpoint,
                                             StartHandler handler) override {
        FakeDaemon::startRecordingWindowLayerContextIDs(windowLayerContextIDs, windowSize, microphoneEnabled,
                                                        cameraEnabled, broadcast, systemRecording,
                                                        captureEnabled, listenerEndpoint, nullptr);
        isRecording = !startError.copy();
        handler(startError.copy(), microphoneEnabled, false);
    }
    void stopRecordingWithHandler(MovieHandler handler) override {
        FakeDaemon::stopRecordingWithHandler(nullptr);
        isRecording = false;
        if (!staysSilent) handler(movie.copy(), stopError.copy());
    }
    void saveVideoToCameraRoll(const URL& movieURL, ErrorHandler handler) override {
        FakeDaemon::saveVideoToCameraRoll(movieURL, nullptr);
        handler(saveError.copy());
    }
    void synchronousGetCurrentState(StateHandler handler) override {
        handler(Dictionary{{"isRecording", isRecording.load()},
                           {"isSystemRecording", isRecording.load()},
                           {"microphoneEnabled", false}});
    }

    std::atomic<bool> isRecording{false};
    std::atomic<bool> staysSilent{false};
    Guarded<OptionalError> startError;
    Guarded<OptionalError> stopError;
    Guarded<OptionalError> saveError;
    Guarded<std::optional<URL>> movie;
};

/// Lets every client in.
class OpenDoor : public IPCListenerDelegate {
  public:
    explicit OpenDoor(std::shared_ptr<ScriptedDaemon> daemon) : daemon_(std::move(daemon)) {}

    bool listenerShouldAcceptNewConnection(IPCListener&, const IPCConnectionRef& connection) override {
        connection->setExported(interfaceOf<KVDaemonProtocol>(),
                                std::make_shared<ProtocolDispatcher<KVDaemonProtocol>>(daemon_));
        connection->setRemoteInterface(interfaceOf<KVClientProtocol>());
        connection->resume();
        client.set(connection);
        return true;
    }

    Guarded<IPCConnectionRef> client;

  private:
    const std::shared_ptr<ScriptedDaemon> daemon_;
};

class KelvoctlRecordingTest : public testing::Test {
  protected:
    KelvoctlRecordingTest() {
        daemon->movie.set(URL::file(root.write("store/movie.mp4", "pixels")));
        listener->setDelegate(door);
        listener->resume();
    }

    RemoteClient client() const { return remoteClient(*door->client.copy(), "cannot tell"); }
    std::string contentOf(const std::string& name) const {
        std::ifstream file(root.path() + "/" + name);
        return {std::istreambuf_iterator<char>(file), {}};
    }

    const test::TemporaryDirectory root;
    const std::string socket = root.path() + "/run/kelvod/com.quillon.kelvod";
    const std::shared_ptr<ScriptedDaemon> daemon = std::make_shared<ScriptedDaemon>();
    const std::shared_ptr<OpenDoor> door = std::make_shared<OpenDoor>(daemon);
    SocketTransport transport{std::make_shared<const DeviceRoot>(root.path(), ""), nullptr};
    const std::shared_ptr<IPCListener> listener = transport.createListener("com.quillon.kelvod");
};

TEST_F(KelvoctlRecordingTest, CtrlCStopsAndSaves) {
    KelvoctlProcess record(socket, {"record"});
    ASSERT_TRUE(record.waitForLine("recording; Ctrl-C")) << record.output();
    record.signal(SIGINT);
    EXPECT_EQ(record.waitForExit(), 0);
    EXPECT_NE(record.output().find(" s to the library\n"), std::string::npos) << record.output();
    ASSERT_THAT(daemon->requests(), ElementsAre("startRecordingWindowLayerContextIDs",
                                                "stopRecordingWithHandler", "saveVideoToCameraRoll"));
    EXPECT_EQ(daemon->arguments()[2], Array{*daemon->movie.copy()});
}

TEST_F(KelvoctlRecordingTest, WholeScreenIsAskedForInTheSizeAndWithTheMicrophoneOfTheLine) {
    EXPECT_EQ(
        KelvoctlProcess::run(socket, {"record", "--size=800x600", "--microphone", "--seconds=0.05"}).first,
        0);
    ASSERT_FALSE(daemon->arguments().empty());
    EXPECT_EQ(daemon->arguments()[0], (Array{Array(), 800.0, 600.0, true, false, false, true, false, false}));
}

TEST_F(KelvoctlRecordingTest, RecordingEndsAfterItsSeconds) {
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_EQ(KelvoctlProcess::run(socket, {"record", "--seconds", "0.2"}).first, 0);
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(200));
}

TEST_F(KelvoctlRecordingTest, OutputGetsTheMovieAndTheLibraryDoesNot) {
    const std::string output = root.path() + "/out.mp4";
    const Answer answer = KelvoctlProcess::run(socket, {"record", "--seconds=0.05", "--output", output});
    EXPECT_EQ(answer.first, 0) << answer.second;
    EXPECT_EQ(contentOf("out.mp4"), "pixels");
    EXPECT_THAT(daemon->requests(), ElementsAre("startRecordingWindowLayerContextIDs",
                                                "stopRecordingWithHandler", "discardRecordingWithHandler"));
}

TEST_F(KelvoctlRecordingTest, MovieThatCannotBePutThereIsSavedInstead) {
    KelvoctlProcess record(socket, {"record", "--output", root.path() + "/folder/out.mp4"});
    EXPECT_EQ(record.waitForExit(), 2);
    std::filesystem::create_directory(root.path() + "/folder");
    KelvoctlProcess again(socket, {"record", "--output", root.path() + "/folder/out.mp4"});
    ASSERT_TRUE(again.waitForLine("recording;"));
    std::filesystem::remove(root.path() + "/folder");
    again.signal(SIGINT);
    EXPECT_EQ(again.waitForExit(), 0);
    EXPECT_NE(again.output().find("cannot put it there"), std::string::npos) << again.output();
    EXPECT_EQ(daemon->requests().back(), "saveVideoToCameraRoll");
}

TEST_F(KelvoctlRecordingTest, ErrorsOfTheDaemonAreTold) {
    daemon->startError.set(errorSaying("cannot start"));
    EXPECT_EQ(KelvoctlProcess::run(socket, {"record"}), Answer(1, "kelvoctl: cannot start (domain -5804)\n"));
    EXPECT_EQ(KelvoctlProcess::answer(socket, {"record", "--json"}),
              "{\"error\":{\"domain\":\"domain\",\"code\":-5804,\"description\":\"cannot start\"}}\n");
}

TEST_F(KelvoctlRecordingTest, FailureToSaveIsTold) {
    daemon->saveError.set(errorSaying("library full"));
    const Answer answer = KelvoctlProcess::run(socket, {"record", "--seconds=0.05"});
    EXPECT_EQ(answer.first, 1);
    EXPECT_NE(answer.second.find("kelvoctl: library full (domain -5804)\n"), std::string::npos)
        << answer.second;
}

TEST_F(KelvoctlRecordingTest, StopThatFailsIsTold) {
    daemon->movie.set(std::nullopt);
    daemon->stopError.set(errorSaying("cannot finish"));
    EXPECT_EQ(KelvoctlProcess::run(socket, {"record", "--seconds=0.05"}).first, 1);
    daemon->stopError.set(std::nullopt);
    EXPECT_EQ(KelvoctlProcess::run(socket, {"record", "--seconds=0.05"}).first, 1);
}

TEST_F(KelvoctlRecordingTest, SecondRecordingIsRefusedAndTheFirstGoesOn) {
    daemon->isRecording = true;
    EXPECT_EQ(KelvoctlProcess::run(socket, {"record"}).first, 4);
    EXPECT_TRUE(daemon->requests().empty());
}

TEST_F(KelvoctlRecordingTest, StopStopsAndSavesWhatSomebodyElseStarted) {
    daemon->isRecording = true;
    EXPECT_EQ(KelvoctlProcess::run(socket, {"stop"}), Answer(0, "saved to the library\n"));
    EXPECT_THAT(daemon->requests(), ElementsAre("stopRecordingWithHandler", "saveVideoToCameraRoll"));
}

TEST_F(KelvoctlRecordingTest, PauseOfAWholeScreenIsSaidToDoNothing) {
    daemon->isRecording = true;
    const Answer answer = KelvoctlProcess::run(socket, {"pause"});
    EXPECT_EQ(answer,
              Answer(1, "kelvoctl: the daemon does not pause a recording of the whole screen; it goes on\n"));
    EXPECT_THAT(daemon->requests(), ElementsAre("pauseRecording"));
}

TEST_F(KelvoctlRecordingTest, RecordingThatTheSystemEndsIsToldWithItsReason) {
    KelvoctlProcess record(socket, {"record"});
    ASSERT_TRUE(record.waitForLine("recording;"));
    client().recordingDidStopWithError(errorSaying("a call came"), std::nullopt);
    EXPECT_EQ(record.waitForExit(), 1);
    EXPECT_NE(record.output().find("kelvoctl: a call came (domain -5804)"), std::string::npos);
}

TEST_F(KelvoctlRecordingTest, RecordingThatTheDeviceLockEndsIsToldWithItsReason) {
    KelvoctlProcess record(socket, {"record"});
    ASSERT_TRUE(record.waitForLine("recording;"));
    client().recordingLockInterrupted(errorSaying("locked"));
    EXPECT_EQ(record.waitForExit(), 1);
    EXPECT_NE(record.output().find("kelvoctl: locked"), std::string::npos);
}

TEST_F(KelvoctlRecordingTest, RecordingThatSomebodyElseStopsEnds) {
    KelvoctlProcess record(socket, {"record"});
    ASSERT_TRUE(record.waitForLine("recording;"));
    client().updateScreenRecordingState();  // it began; still runs
    daemon->isRecording = false;
    client().updateScreenRecordingState();
    EXPECT_EQ(record.waitForExit(), 0);
    EXPECT_NE(record.output().find("stopped from elsewhere"), std::string::npos);
}

TEST_F(KelvoctlRecordingTest, SecondCtrlCLeavesWithoutWaiting) {
    daemon->staysSilent = true;
    KelvoctlProcess record(socket, {"record"});
    ASSERT_TRUE(record.waitForLine("recording;"));
    record.signal(SIGINT);
    ASSERT_TRUE(test::eventually([this] { return !daemon->isRecording; }));
    record.signal(SIGINT);
    EXPECT_EQ(record.waitForExit(), std::nullopt);  // the signal ended it
}

TEST_F(KelvoctlRecordingTest, WatchPrintsEachCallback) {
    KelvoctlProcess watch(socket, {"watch", "--json"});
    ASSERT_TRUE(test::eventually([this] { return door->client.copy() != nullptr; }));
    client().recordingTimerDidUpdate("0:05");
    client().recordingDidStopWithError(std::nullopt, URL("file:///a"));
    client().updateBroadcastURL(URL("https://x"));
    ASSERT_TRUE(watch.waitForLine("updateBroadcastURL"));
    EXPECT_EQ(watch.output(),
              "{\"callback\":\"recordingTimerDidUpdate\",\"timerText\":\"0:05\"}\n"
              "{\"callback\":\"recordingDidStopWithError\",\"error\":null,\"movieURL\":\"file:///a\"}\n"
              "{\"callback\":\"updateBroadcastURL\",\"broadcastURL\":\"https://x\"}\n");
}

TEST_F(KelvoctlRecordingTest, ExtensionsAreListed) {
    EXPECT_EQ(KelvoctlProcess::run(socket, {"extensions"}), Answer(0, "One\t\nTwo\t\n"));
    EXPECT_EQ(KelvoctlProcess::answer(socket, {"extensions", "--json"}),
              "{\"displayName\":\"One\"}\n{\"displayName\":\"Two\"}\n");
}

}  // namespace
}  // namespace kelvo
