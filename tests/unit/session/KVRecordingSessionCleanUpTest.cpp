#include "SessionFixture.h"

#include <future>

#include <gmock/gmock.h>

namespace kelvo::test {
namespace {

using testing::ElementsAre;

/// A file system that looks at nothing before the test lets it.
class HeldFileSystem : public SimulatedFileSystem {
  public:
    using SimulatedFileSystem::SimulatedFileSystem;

    bool itemExists(std::string_view path) override {
        looked_.set_value();
        released_.get_future().wait();
        return SimulatedFileSystem::itemExists(path);
    }
    void awaitLook() { looked_.get_future().wait(); }
    void release() { released_.set_value(); }

  private:
    std::promise<void> looked_;
    std::promise<void> released_;
};

/// A recording is thrown away, and the removal of its movie takes until the test ends it.
class KVRecordingSessionCleanUpTest : public SessionFixture {
  protected:
    KVRecordingSessionCleanUpTest() {
        held.store = std::make_shared<KVTemporaryFileStore>(files, device.textFolding, device.clock);
        session = KVRecordingSession::create("com.example.paint", held);
        configure();
        start();
        session->finishAndCleanupSessionFilesWithHandler([this] { note("cleaned up"); });
        files->awaitLook();
    }

    void note(const std::string& event) {
        events.with([&](auto& all) { all.push_back(event); });
    }
    /// Begins another recording, and lets the removal end.
    void startAnother(const std::shared_ptr<KVRecordingSession>& another) {
        const auto thrownAway = writer;
        another->setRecording(true);
        another->startSessionWithHandler([this] { note("started"); });
        ASSERT_NE(writer, thrownAway);
        EXPECT_FALSE(writer->startHandler) << "the removal would take the new movie with it";
        files->release();
        GlobalQueue::drain();
        ASSERT_TRUE(writer->startHandler);
        writer->startHandler();
        EXPECT_THAT(events.copy(), ElementsAre("cleaned up", "started"));
    }

    const std::shared_ptr<HeldFileSystem> files =
        std::make_shared<HeldFileSystem>(device.clock, device.faults);
    KVRecordingSession::Services held = services();
    Guarded<std::vector<std::string>> events;
};

TEST_F(KVRecordingSessionCleanUpTest, NextMovieIsBegunWhenTheThrownAwayOneIsGone) {
    startAnother(session);
}

TEST_F(KVRecordingSessionCleanUpTest, MovieOfAnApplicationOfTheSameNameWaitsToo) {
    SimulatedBundleContent namesake;
    namesake.bundleIdentifier = "com.example.other";
    namesake.name = "Paint";
    device.bundles->addBundle("/Applications/Other.app", namesake);
    const auto another = KVRecordingSession::create("com.example.other", held);
    ASSERT_EQ(another->outputPath(), session->outputPath());
    startAnother(another);
}

TEST_F(KVRecordingSessionCleanUpTest, RecordingThatIsStoppedWhileItWaitsCapturesNothing) {
    session->setRecording(true);
    session->startSessionWithHandler([this] { note("started"); });
    finish();
    files->release();
    GlobalQueue::drain();
    writer->startHandler();
    EXPECT_THAT(events.copy(), ElementsAre("cleaned up", "started"));
    EXPECT_EQ(log.count("starting capture with VelaCaptureController"), 1U) << "the first one's";
}

}  // namespace
}  // namespace kelvo::test
