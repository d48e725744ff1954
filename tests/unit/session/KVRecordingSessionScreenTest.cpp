#include "SessionFixture.h"

#include <algorithm>

namespace kelvo::test {
namespace {

/// Makes screen sources that note what is done with them and deliver nothing.
class NotedSources : public ScreenCaptureService {
  public:
    struct Made {
        Size size;
        MediaTime interval;
    };

    std::shared_ptr<ScreenCaptureSource> createSource(const Size& size, const MediaTime& interval) override {
        made.push_back({size, interval});
        return std::make_shared<Source>(*this);
    }

    std::vector<Made> made;
    std::vector<std::string> calls;

  private:
    class Source : public ScreenCaptureSource {
      public:
        explicit Source(NotedSources& owner) : owner_(owner) {}
        void setDelegate(std::weak_ptr<ScreenCaptureDelegate> delegate) override {
            owner_.calls.emplace_back(delegate.expired() ? "no delegate" : "delegate");
        }
        void startCapture() override { owner_.calls.emplace_back("start"); }
        void stopCapture() override { owner_.calls.emplace_back("stop"); }
        std::uint64_t skippedFrameCount() const override { return 0; }

      private:
        NotedSources& owner_;
    };
};

class KVRecordingSessionScreenTest : public SessionFixture {
  protected:
    using Calls = std::vector<std::string>;

    KVRecordingSessionScreenTest() {
        KVRecordingSession::Services withSources = services();
        withSources.platform.screenCapture = sources;
        session = KVRecordingSession::create("com.example.paint", withSources);
        configure();
    }

    std::shared_ptr<NotedSources> sources = std::make_shared<NotedSources>();
};

TEST_F(KVRecordingSessionScreenTest, SourceHasTheCaptureSizeAndSixtyFramesASecond) {
    session->setWindowSize({3000, 2000});
    start();
    ASSERT_EQ(sources->made.size(), 1U);
    EXPECT_EQ(sources->made.front().size, (Size{1920, 1280}));
    EXPECT_EQ(sources->made.front().interval, MediaTime::make(1, 60));
}

TEST_F(KVRecordingSessionScreenTest, SourceOfABroadcastHasThirtyFramesASecond) {
    broadcast(BroadcastProcessMode::movieClips);
    start();
    ASSERT_EQ(sources->made.size(), 1U);
    EXPECT_EQ(sources->made.front().interval, MediaTime::make(1, 30));
}

TEST_F(KVRecordingSessionScreenTest, SourceIsKeptAndGetsItsDelegateEachTime) {
    start();
    session->pauseSession();
    session->resumeSessionWithContextID(11);
    finish();
    start();
    EXPECT_EQ(sources->made.size(), 1U);
    EXPECT_EQ(sources->calls, (Calls{"delegate", "start", "stop", "no delegate", "delegate", "start", "stop",
                                     "no delegate", "delegate", "start"}));
}

TEST_F(KVRecordingSessionScreenTest, CaptureStopsBeforeSoundAndMirroring) {
    start();
    captureManager->calls.clear();
    sources->calls.clear();
    session->stopAllCapture();
    EXPECT_EQ(sources->calls, (Calls{"stop", "no delegate"}));
    EXPECT_EQ(captureManager->calls, Calls{"stop all"});
    EXPECT_EQ(device.screen->mode(), MirroringMode::off);
}

TEST_F(KVRecordingSessionScreenTest, FinishInAnUnknownProcessModeDoesNothingFurther) {
    start();
    session->setBroadcastProcessMode(static_cast<BroadcastProcessMode>(7));
    EXPECT_TRUE(finish().empty());
    EXPECT_FALSE(session->isRecording());
    EXPECT_FALSE(writer->finishHandler);
}

}  // namespace
}  // namespace kelvo::test
