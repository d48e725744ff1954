#include "ManagerFixture.h"
#include "daemon/RunDaemon.h"

#include <future>

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class ManagerTerminationTest : public test::ManagerFixture {
  protected:
    ManagerTerminationTest() { createManager(); }

    URL addMovie() {
        const std::string path = std::string(kStore) + "/movie.mp4";
        device.fileSystem->addFile(path, 100);
        device.media->addMovie(URL::file(path), {});
        return URL::file(path);
    }
    void terminate() {
        manager->finishForTermination([this] { isOver = true; });
        KVConnectionManager::connectionManagerQueue().sync([] {});
    }
    /// Mixing works on a queue of its own.
    void waitForTheEnd() {
        while (!isOver) {
            device.settle();
            std::this_thread::yield();
        }
    }

    std::atomic<bool> isOver{false};
};

TEST_F(ManagerTerminationTest, WithNothingToDoTheEndComesAtOnce) {
    session("a");
    terminate();
    EXPECT_TRUE(isOver);
}

TEST_F(ManagerTerminationTest, SystemRecordingIsFinishedAndSavedFirst) {
    const auto system = recordingSystemSession();
    const URL movie = addMovie();
    terminate();
    EXPECT_FALSE(isOver);
    system->completeFinish(movie, std::nullopt);
    waitForTheEnd();
    EXPECT_EQ(device.photoLibrary->items().size(), 1U);
    EXPECT_FALSE(device.fileSystem->itemExists(movie.path()));
    EXPECT_THAT(system->client->stops.copy(),
                ElementsAre(testing::Field(&test::FakeClientProxy::Stop::movieURL, std::nullopt)));
    EXPECT_THAT(stopCodes(*system), ElementsAre(-5806));
}

TEST_F(ManagerTerminationTest, InAppRecordingIsFinishedAndItsMovieLeft) {
    const auto application = recordingSession("a");
    const URL movie = addMovie();
    terminate();
    application->completeFinish(movie, std::nullopt);
    EXPECT_TRUE(isOver);
    EXPECT_THAT(device.photoLibrary->items(), IsEmpty());
    EXPECT_TRUE(device.fileSystem->itemExists(movie.path()));
    EXPECT_EQ(application->client->stops.copy().front().movieURL, movie);
}

TEST_F(ManagerTerminationTest, StopUnderWayIsWaitedFor) {
    SimulatedBundleContent content;
    content.bundleIdentifier = "a";
    device.bundles->addBundle("/Applications/A", content);
    device.bundles->addProcess(10, "/Applications/A/program");
    const auto connection = std::make_shared<SimulatedConnection>(10, Dictionary());
    device.ipc->setCurrentConnection(connection);
    const auto application = recordingSession("a");
    int answers = 0;
    manager->stopRecordingWithHandler([&](const auto&, const auto&) { ++answers; });
    terminate();
    EXPECT_FALSE(isOver);
    application->completeFinish(std::nullopt, std::nullopt);
    EXPECT_TRUE(isOver);
    EXPECT_EQ(answers, 1);
}

TEST_F(ManagerTerminationTest, SaveUnderWayIsWaitedFor) {
    std::atomic<int> answers = 0;
    manager->saveVideoToCameraRoll(std::optional(addMovie()), [&](const OptionalError&) { ++answers; });
    terminate();
    waitForTheEnd();
    EXPECT_EQ(answers, 1);
    EXPECT_EQ(device.photoLibrary->items().size(), 1U);
}

TEST_F(ManagerTerminationTest, NothingStartsAnyMore) {
    terminate();
    std::vector<std::int64_t> codes;
    manager->startRecordingWindowLayerContextIDs(
        {}, {1, 1}, false, false, false, true, false, nullptr,
        [&](const OptionalError& error, bool, bool) { codes.push_back(error ? error->code() : 0); });
    EXPECT_THAT(codes, ElementsAre(-5806));
}

class EndDaemonTest : public test::ManagerFixture {};

TEST_F(EndDaemonTest, AlertThatNobodyAnswersDoesNotHoldUpTheEnd) {
    std::promise<void> isReady;
    auto end = std::async(std::launch::async, [&] {
        isReady.get_future().wait();
        const auto alert = *device.alerts->createAlert({});
        auto answer = std::async(std::launch::async, [&] { return alert->waitForResponse(); });
        endDaemon(device.platform(), std::chrono::hours(1));
        return answer.get();
    });
    runDaemon(
        device.platform(), [](const std::string&) { return nullptr; }, [&] { isReady.set_value(); });
    EXPECT_EQ(end.get(), SystemAlertResponse::cancelled);
    EXPECT_FALSE(log.contains("kelvod ends before everything is saved"));
}

TEST_F(EndDaemonTest, PatienceHasAnEnd) {
    std::shared_ptr<test::FakeRecordingSession> recording;
    std::promise<void> isReady;
    auto end = std::async(std::launch::async, [&] {
        isReady.get_future().wait();
        // A session that never finishes.
        const auto listener = device.ipc->listeners().front();
        endDaemon(device.platform(), std::chrono::milliseconds(1));
    });
    device.ipc->setIdentity(11, {{"com.quillon.private.kelvo-kit", true}});
    SimulatedBundleContent content;
    content.bundleIdentifier = "com.quillon.plinth";
    device.bundles->addBundle("/Applications/Shell", content);
    device.bundles->addProcess(11, "/Applications/Shell/program");
    runDaemon(
        device.platform(),
        [&](const std::string& bundleID) {
            recording = std::make_shared<test::FakeRecordingSession>(bundleID);
            recording->recording = true;
            return recording;
        },
        [&] {
            const auto connection = *device.ipc->connectToService("com.quillon.kelvod");
            isReady.set_value();
        });
    end.get();
    EXPECT_TRUE(log.contains("kelvod ends before everything is saved; the rest is in the store"));
    if (recording) recording->finish = nullptr;
}

}  // namespace
}  // namespace kelvo
