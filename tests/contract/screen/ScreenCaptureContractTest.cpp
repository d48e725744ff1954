#include "ScreenUnderTest.h"
#include "support/FrameRecorder.h"

#include <algorithm>
#include <fcntl.h>
#include <future>
#include <sys/mman.h>

#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

using namespace std::chrono_literals;

constexpr Size kWholeScreen{kScreenWidth, kScreenHeight};
constexpr std::chrono::nanoseconds kInterval = 50ms;

template <typename Screen>
class ScreenCaptureContract : public testing::Test {
  protected:
    ScreenCaptureContract() { source_->setDelegate(recorder_); }
    ~ScreenCaptureContract() override { source_->stopCapture(); }

    void start(MirroringMode mode = MirroringMode::wholeScreen) {
        screen_.mirroring().setMode(mode);
        source_->startCapture();
    }
    void startAndAwaitFirstFrame() {
        start();
        ASSERT_TRUE(screen_.eventually([&] { return recorder_->count() > 0; }));
        settle();
    }
    /// Lets whatever is still under way come.
    void settle() { screen_.wait(200ms); }
    bool awaitNumber(std::uint32_t number) {
        return screen_.eventually([&] { return recorder_->hasNumber(number); });
    }
    std::shared_ptr<ScreenCaptureSource> createSource(const Size& size = kWholeScreen) {
        return screen_.service().createSource(size, MediaTime::make(1, 20));
    }

    Screen screen_;
    std::shared_ptr<FrameRecorder> recorder_ = std::make_shared<FrameRecorder>();
    std::shared_ptr<ScreenCaptureSource> source_ = createSource();
};

using Screens = testing::Types<SimulatedScreenUnderTest, X11ScreenUnderTest>;
struct ScreenNames {
    template <typename Screen>
    static std::string GetName(int) {
        return std::is_same_v<Screen, X11ScreenUnderTest> ? "X11" : "Simulated";
    }
};
TYPED_TEST_SUITE(ScreenCaptureContract, Screens, ScreenNames);

TYPED_TEST(ScreenCaptureContract, FirstFrameComesWithoutAChange) {
    this->screen_.show(7);
    this->start();
    EXPECT_TRUE(this->awaitNumber(7));
}

TYPED_TEST(ScreenCaptureContract, EveryPictureThatStaysIsDeliveredOnceAndInOrder) {
    this->startAndAwaitFirstFrame();
    for (std::uint32_t number = 100; number < 110; ++number) {
        this->screen_.show(number);
        ASSERT_TRUE(this->awaitNumber(number));
        this->screen_.wait(60ms);
    }
    std::vector<std::uint32_t> numbers;
    for (const auto& frame : this->recorder_->frames()) {
        if (frame.number && *frame.number >= 100) numbers.push_back(*frame.number);
    }
    EXPECT_EQ(numbers, (std::vector<std::uint32_t>{100, 101, 102, 103, 104, 105, 106, 107, 108, 109}));
}

TYPED_TEST(ScreenCaptureContract, NothingIsDeliveredWhileNothingChanges) {
    this->startAndAwaitFirstFrame();
    const auto before = this->recorder_->count();
    this->screen_.wait(500ms);
    EXPECT_EQ(this->recorder_->count(), before);
}

TYPED_TEST(ScreenCaptureContract, BurstIsThinnedOutButItsLastPictureIsDelivered) {
    this->startAndAwaitFirstFrame();
    const auto before = this->recorder_->count();
    const auto begin = this->screen_.now();
    for (std::uint32_t number = 1; number <= 60; ++number) {
        this->screen_.show(number);
        this->screen_.wait(2ms);
    }
    EXPECT_TRUE(this->awaitNumber(60));
    const auto intervals = (this->screen_.now() - begin) / kInterval;
    EXPECT_LE(this->recorder_->count() - before, static_cast<std::size_t>(intervals) + 2);
}

TYPED_TEST(ScreenCaptureContract, TimesAreOnTheMonotonicClockAndIncrease) {
    const auto begin = this->screen_.now();
    this->startAndAwaitFirstFrame();
    for (std::uint32_t number = 1; number <= 5; ++number) {
        this->screen_.show(number);
        ASSERT_TRUE(this->awaitNumber(number));
    }
    std::int64_t last = begin.count() - 1;
    for (const auto& frame : this->recorder_->frames()) {
        EXPECT_EQ(frame.time.timescale, 1000000000);
        EXPECT_GT(frame.time.value, last);
        last = frame.time.value;
    }
    EXPECT_LE(last, this->screen_.now().count());
}

TYPED_TEST(ScreenCaptureContract, NoFrameComesAfterStopReturned) {
    this->startAndAwaitFirstFrame();
    this->screen_.show(1);
    this->source_->stopCapture();
    const auto count = this->recorder_->count();
    this->screen_.show(2);
    this->screen_.wait(200ms);
    EXPECT_EQ(this->recorder_->count(), count);
}

TYPED_TEST(ScreenCaptureContract, StopWaitsForTheFrameThatIsBeingDelivered) {
    this->startAndAwaitFirstFrame();
    std::promise<void> entered;
    std::promise<void> mayLeave;
    std::atomic<bool> left{false};
    this->recorder_->onFrame([&, once = std::make_shared<std::once_flag>()](auto&, const auto&) {
        std::call_once(*once, [&] {
            entered.set_value();
            mayLeave.get_future().wait();
            left = true;
        });
    });
    std::thread display([&] {
        this->screen_.wait(100ms);
        this->screen_.show(1);
    });
    entered.get_future().wait();
    std::atomic<bool> leftBeforeStopReturned{false};
    std::thread stopper([&] {
        this->source_->stopCapture();
        leftBeforeStopReturned = left.load();
    });
    mayLeave.set_value();
    stopper.join();
    display.join();
    EXPECT_TRUE(leftBeforeStopReturned);
}

TYPED_TEST(ScreenCaptureContract, StopFromWithinAFrameMakesItTheLast) {
    this->recorder_->onFrame([](ScreenCaptureSource& source, const auto&) { source.stopCapture(); });
    this->start();
    ASSERT_TRUE(this->screen_.eventually([&] { return this->recorder_->count() > 0; }));
    this->screen_.show(1);
    this->screen_.wait(200ms);
    EXPECT_EQ(this->recorder_->count(), 1U);
}

TYPED_TEST(ScreenCaptureContract, RestartFromWithinAFrameGoesOn) {
    this->recorder_->onFrame([&, once = std::make_shared<std::once_flag>()](auto& source, const auto&) {
        std::call_once(*once, [&] {
            source.stopCapture();
            source.startCapture();
        });
    });
    this->start();
    ASSERT_TRUE(this->screen_.eventually([&] { return this->recorder_->count() > 1; }));
    this->screen_.show(3);
    EXPECT_TRUE(this->awaitNumber(3));
}

TYPED_TEST(ScreenCaptureContract, RestartFromWithinAFrameCanBeStoppedThere) {
    this->recorder_->onFrame([](ScreenCaptureSource& source, const auto&) {
        source.stopCapture();
        source.startCapture();
        source.stopCapture();
    });
    this->start();
    ASSERT_TRUE(this->screen_.eventually([&] { return this->recorder_->count() > 0; }));
    this->screen_.show(1);
    this->screen_.wait(200ms);
    EXPECT_EQ(this->recorder_->count(), 1U);
}

TYPED_TEST(ScreenCaptureContract, StoppedSourceCanBeStartedAgain) {
    this->startAndAwaitFirstFrame();
    this->source_->stopCapture();
    this->screen_.show(5);
    this->source_->startCapture();
    EXPECT_TRUE(this->awaitNumber(5));
}

TYPED_TEST(ScreenCaptureContract, SecondStartChangesNothing) {
    this->startAndAwaitFirstFrame();
    const auto count = this->recorder_->count();
    this->source_->startCapture();
    this->screen_.wait(200ms);
    EXPECT_EQ(this->recorder_->count(), count);
}

TYPED_TEST(ScreenCaptureContract, StopWithoutAStartIsHarmless) {
    this->source_->stopCapture();
    this->startAndAwaitFirstFrame();
}

TYPED_TEST(ScreenCaptureContract, HeldFramesAreBoundedAndLaterOnesAreSkippedAndCounted) {
    this->recorder_->holdAll();
    this->startAndAwaitFirstFrame();
    for (std::uint32_t number = 1; number <= 12; ++number) {
        this->screen_.show(number);
        this->screen_.wait(70ms);
    }
    EXPECT_LE(this->recorder_->count(), 10U);
    EXPECT_GT(this->source_->skippedFrameCount(), 0U);
    this->recorder_->letGo();
    EXPECT_TRUE(this->awaitNumber(12)) << "the newest picture follows once there is a surface for it";
}

TYPED_TEST(ScreenCaptureContract, HeldFrameKeepsItsPicture) {
    this->screen_.show(1);
    this->recorder_->keepLast();
    this->start();
    ASSERT_TRUE(this->awaitNumber(1));
    this->settle();
    const VideoSurfaceRef held = this->recorder_->lastSurface();
    this->screen_.show(2);
    ASSERT_TRUE(this->awaitNumber(2));
    EXPECT_EQ(NumberedPicture::read(*held), 1U);
}

TYPED_TEST(ScreenCaptureContract, ReceiverOfASurfaceCanOnlyRead) {
    this->recorder_->keepLast();
    this->startAndAwaitFirstFrame();
    const VideoSurfaceRef surface = this->recorder_->lastSurface();
    ASSERT_TRUE(surface);
    const auto size = surface->geometry().byteCount();
    EXPECT_EQ(::mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED, surface->descriptor(), 0),
              MAP_FAILED);
    EXPECT_EQ(::fcntl(surface->descriptor(), F_GET_SEALS),
              F_SEAL_SEAL | F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_FUTURE_WRITE);
    const auto received =
        VideoSurface::fromDescriptor(UniqueFd(::dup(surface->descriptor())), surface->geometry());
    ASSERT_TRUE(received);
    EXPECT_EQ(NumberedPicture::read(**received), NumberedPicture::read(*surface));
}

TYPED_TEST(ScreenCaptureContract, NothingIsSeenWhileMirroringIsOff) {
    this->start(MirroringMode::off);
    this->screen_.show(1);
    this->screen_.wait(200ms);
    EXPECT_EQ(this->recorder_->count(), 0U);
    this->screen_.mirroring().setMode(MirroringMode::wholeScreen);
    EXPECT_TRUE(this->awaitNumber(1));
}

TYPED_TEST(ScreenCaptureContract, MirroringSwitchedOffEndsFramesOfARunningSource) {
    this->startAndAwaitFirstFrame();
    this->screen_.mirroring().setMode(MirroringMode::off);
    this->screen_.wait(200ms);
    const auto count = this->recorder_->count();
    this->screen_.show(9);
    this->screen_.wait(200ms);
    EXPECT_EQ(this->recorder_->count(), count);
}

TYPED_TEST(ScreenCaptureContract, FramesHaveTheScreensSizeWhenThatFits) {
    this->source_ = this->createSource({1080, 1920});
    this->source_->setDelegate(this->recorder_);
    this->startAndAwaitFirstFrame();
    EXPECT_EQ(this->recorder_->last()->width, 160U);
    EXPECT_EQ(this->recorder_->last()->height, 240U);
}

TYPED_TEST(ScreenCaptureContract, LargerScreenIsScaledDownToFit) {
    this->screen_.show(1234);
    this->source_ = this->createSource({80, 80});
    this->source_->setDelegate(this->recorder_);
    this->start();
    ASSERT_TRUE(this->awaitNumber(1234));
    EXPECT_EQ(this->recorder_->last()->width, 53U);
    EXPECT_EQ(this->recorder_->last()->height, 80U);
}

TYPED_TEST(ScreenCaptureContract, ScreenThatTurnsIsFollowed) {
    this->startAndAwaitFirstFrame();
    this->screen_.resize(240, 160);
    this->screen_.show(77);
    ASSERT_TRUE(this->awaitNumber(77));
    EXPECT_EQ(this->recorder_->last()->width, 240U);
    EXPECT_EQ(this->recorder_->last()->height, 160U);
}

TYPED_TEST(ScreenCaptureContract, LostDisplayIsReportedOnceAndIsTheLastCall) {
    this->startAndAwaitFirstFrame();
    this->screen_.die();
    ASSERT_TRUE(this->screen_.eventually([&] { return !this->recorder_->failures().empty(); }));
    const auto count = this->recorder_->count();
    this->screen_.wait(200ms);
    EXPECT_EQ(this->recorder_->failures(), std::vector{ScreenCaptureStatus::lost});
    EXPECT_EQ(this->recorder_->count(), count);
    this->source_->stopCapture();
}

TYPED_TEST(ScreenCaptureContract, StopFromWithinAFailureReturns) {
    this->startAndAwaitFirstFrame();
    std::atomic<bool> stopped{false};
    this->recorder_->onFailure([&](ScreenCaptureSource& source) {
        source.stopCapture();
        stopped = true;
    });
    this->screen_.die();
    EXPECT_TRUE(this->screen_.eventually([&] { return stopped.load(); }));
}

TYPED_TEST(ScreenCaptureContract, SourceWithoutALivingDelegateRunsOn) {
    this->startAndAwaitFirstFrame();
    this->recorder_.reset();
    this->screen_.show(1);
    this->screen_.wait(100ms);
    this->recorder_ = std::make_shared<FrameRecorder>();
    this->source_->setDelegate(this->recorder_);
    this->screen_.show(2);
    EXPECT_TRUE(this->awaitNumber(2));
}

TYPED_TEST(ScreenCaptureContract, SurfacesOutliveTheirSource) {
    this->screen_.show(42);
    this->recorder_->keepLast();
    this->start();
    ASSERT_TRUE(this->awaitNumber(42));
    const VideoSurfaceRef surface = this->recorder_->lastSurface();
    this->source_->stopCapture();
    this->source_.reset();
    EXPECT_EQ(NumberedPicture::read(*surface), 42U);
    this->source_ = this->createSource();
}

}  // namespace
}  // namespace kelvo::test
