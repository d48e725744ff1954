#include "ManagerFixture.h"
#include "support/Eventually.h"

namespace kelvo {
namespace {

constexpr std::int32_t kShell = 10;

/// A photo library during whose change a test may look around.
class WatchedLibrary : public PhotoLibrary {
  public:
    explicit WatchedLibrary(std::function<void()> during) : during_(std::move(during)) {}
    Result<PhotoAsset> createVideoAsset(const URL&) override {
        during_();
        return KVError::posix(ENOSPC, "library");
    }
    std::optional<PhotoAsset> assetWithLocalIdentifier(std::string_view) override { return std::nullopt; }
    Result<std::vector<PhotoAssetDetails>> assets() override { return std::vector<PhotoAssetDetails>(); }
    OptionalError deleteAsset(const PhotoAsset&) override { return std::nullopt; }

  private:
    const std::function<void()> during_;
};

/// A movie of the whole screen, from its recording until somebody has decided what becomes of it.
class ManagerMovieUseTest : public test::ManagerFixture {
  protected:
    ManagerMovieUseTest() {
        device.fileSystem->addFile(kMovie.path(), 100);
        device.media->addMovie(kMovie, {});
        SimulatedBundleContent content;
        content.bundleIdentifier = "com.quillon.plinth";
        device.bundles->addBundle("/Applications/shell", content);
        device.bundles->addProcess(kShell, "/Applications/shell/program");
    }

    void begin() {
        createManager();
        connection = std::make_shared<SimulatedConnection>(
            kShell, Dictionary{{"com.quillon.private.kelvo-kit", true}});
        device.ipc->setCurrentConnection(connection);
        manager->connectionManagerDidAcceptNewConnection(connection, "com.quillon.plinth");
        recording = recordingSystemSession();
        recording->ownMovie = kMovie;
    }
    /// The shell's stop, which the session has finished.
    void stop() {
        manager->stopRecordingWithHandler([](const auto&, const auto&) {});
        recording->completeFinish(kMovie, std::nullopt);
    }
    bool isInUse() const { return manager->isMovieInUse("movie.mp4"); }

    const URL kMovie = URL::file(std::string(kStore) + "/movie.mp4");
    std::shared_ptr<SimulatedConnection> connection;
    std::shared_ptr<test::FakeRecordingSession> recording;
};

TEST_F(ManagerMovieUseTest, RecordingThatRunsIsInUse) {
    begin();
    EXPECT_TRUE(isInUse());
    recording->recording = false;
    EXPECT_FALSE(isInUse());
    EXPECT_FALSE(manager->isMovieInUse("another.mp4"));
}

TEST_F(ManagerMovieUseTest, StoppedMovieIsItsClientsUntilThatIsGone) {
    begin();
    stop();
    EXPECT_TRUE(isInUse());
    EXPECT_FALSE(manager->isMovieInUse("another.mp4"));
    manager->applicationDisconnectedWithBundleID("com.quillon.plinth", kShell + 1);
    EXPECT_TRUE(isInUse());
    manager->applicationDisconnectedWithBundleID("com.quillon.plinth", kShell);
    EXPECT_FALSE(isInUse());
}

TEST_F(ManagerMovieUseTest, MovieForAClientThatLeftMeanwhileIsNobodys) {
    begin();
    manager->stopRecordingWithHandler([](const auto&, const auto&) {});
    manager->applicationDisconnectedWithBundleID("com.quillon.plinth", kShell);
    recording->completeFinish(kMovie, std::nullopt);
    EXPECT_FALSE(isInUse());
}

TEST_F(ManagerMovieUseTest, DiscardEndsTheUse) {
    begin();
    stop();
    manager->discardRecordingWithHandler(nullptr);
    EXPECT_FALSE(isInUse());
}

TEST_F(ManagerMovieUseTest, MovieIsInUseWhileItIsSavedWhoeverHasGone) {
    begin();
    stop();
    device.media->holdExports(true);
    std::atomic<bool> isSaved = false;
    manager->saveVideoToCameraRoll(kMovie, [&](const OptionalError&) { isSaved = true; });
    manager->applicationDisconnectedWithBundleID("com.quillon.plinth", kShell);
    while (device.media->exportSessions().empty())
        device.settle();
    EXPECT_TRUE(isInUse());
    device.media->exportSessions().front()->resume();
    while (!isSaved || isInUse())
        device.settle();
    EXPECT_FALSE(device.fileSystem->itemExists(kMovie.path()));
}

TEST_F(ManagerMovieUseTest, SaveEndsTheUseAlsoOfAClientThatStays) {
    begin();
    stop();
    std::atomic<bool> isSaved = false;
    manager->saveVideoToCameraRoll(kMovie, [&](const OptionalError&) { isSaved = true; });
    EXPECT_TRUE(test::eventually([&] {
        device.settle();
        return isSaved && !isInUse();
    }));
}

TEST_F(ManagerMovieUseTest, MovieIsInUseWhileItIsSavedForTheNextRecording) {
    bool wasInUse = false;
    Platform platform = device.platform();
    platform.photoLibrary = std::make_shared<WatchedLibrary>([&] { wasInUse = isInUse(); });
    recording = std::make_shared<test::FakeRecordingSession>("com.quillon.plinth");
    manager = KVRecordingManager::create(platform, [this](const std::string&) { return recording; });
    recordingSystemSession()->ownMovie = kMovie;
    manager->stopCurrentRecordingSessionWithHandler(nullptr);
    recording->completeFinish(kMovie, std::nullopt);
    EXPECT_TRUE(wasInUse);
    EXPECT_FALSE(isInUse());
}

}  // namespace
}  // namespace kelvo
