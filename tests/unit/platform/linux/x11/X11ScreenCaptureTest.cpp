#include "platform/linux/x11/X11Screen.h"
#include "support/Eventually.h"
#include "support/FrameRecorder.h"
#include "support/LogRecorder.h"
#include "support/x11/XClient.h"
#include "support/x11/XvfbServer.h"

#include <chrono>
#include <cstring>
#include <filesystem>
#include <thread>

#include <gtest/gtest.h>

namespace kelvo::x11 {
namespace {

using namespace std::chrono_literals;
using test::eventually;

std::ptrdiff_t entriesIn(const char* directory) {
    return std::distance(std::filesystem::directory_iterator(directory),
                         std::filesystem::directory_iterator());
}

class X11ScreenCaptureTest : public testing::Test {
  protected:
    X11ScreenCaptureTest() {
        recorder_->keepLast();
        source_->setDelegate(recorder_);
        screen_.setMode(MirroringMode::wholeScreen);
    }
    ~X11ScreenCaptureTest() override { source_->stopCapture(); }

    bool startAndAwaitFrame() {
        source_->startCapture();
        return eventually([&] { return recorder_->count() > 0; });
    }
    int differentPixels(const VideoSurface& left, const VideoSurface& right) const {
        int count = 0;
        for (std::size_t i = 0; i + 3 < left.pixels().size(); i += 4)
            count += std::memcmp(left.pixels().data() + i, right.pixels().data() + i, 3) != 0 ? 1 : 0;
        return count;
    }

    test::XvfbServer server_{200, 160, test::XvfbServer::ownDisplay()};
    test::XClient client_{server_.display()};
    X11Screen screen_{server_.display()};
    std::shared_ptr<test::FrameRecorder> recorder_ = std::make_shared<test::FrameRecorder>();
    std::shared_ptr<ScreenCaptureSource> source_ = screen_.createSource({200, 160}, MediaTime::make(1, 60));
};

TEST_F(X11ScreenCaptureTest, CursorIsBlendedInAndItsMoveAloneYieldsAFrame) {
    client_.createWindow({0, 0, 200, 160}, 0x00FF00);
    client_.movePointer(20, 20);
    ASSERT_TRUE(startAndAwaitFrame());
    std::this_thread::sleep_for(200ms);
    const VideoSurfaceRef before = recorder_->lastSurface();
    const auto count = recorder_->count();
    client_.movePointer(120, 100);
    ASSERT_TRUE(eventually([&] { return recorder_->count() > count; }));
    std::this_thread::sleep_for(100ms);
    EXPECT_GT(differentPixels(*before, *recorder_->lastSurface()), 10);
}

TEST_F(X11ScreenCaptureTest, UnreachableDisplayIsReportedAndNamedInTheLog) {
    const test::LogRecorder log;
    X11Screen nowhere(":4711");
    nowhere.setMode(MirroringMode::wholeScreen);
    const auto source = nowhere.createSource({100, 100}, MediaTime::make(1, 60));
    source->setDelegate(recorder_);
    source->startCapture();
    EXPECT_TRUE(
        eventually([&] { return recorder_->failures() == std::vector{ScreenCaptureStatus::unreachable}; }));
    EXPECT_TRUE(
        log.contains("cannot record the screen: cannot reach the display :4711, which must run on this "
                     "machine and take whoever has the cookie in XAUTHORITY"));
}

TEST_F(X11ScreenCaptureTest, SourceCanBeStartedAgainAfterTheDisplayCameBack) {
    ASSERT_TRUE(startAndAwaitFrame());
    server_.kill();
    ASSERT_TRUE(eventually([&] { return !recorder_->failures().empty(); }));
    const auto count = recorder_->count();
    const test::XvfbServer successor(200, 160, server_.display());
    source_->startCapture();
    EXPECT_TRUE(eventually([&] { return recorder_->count() > count; }));
}

TEST_F(X11ScreenCaptureTest, DisplayThatDiesMidFrameEndsTheSource) {
    const auto window = client_.createWindow({0, 0, 200, 160}, 0);
    ASSERT_TRUE(startAndAwaitFrame());
    for (std::uint32_t number = 0; number < 50; ++number) {
        client_.showNumber(window, number);
        if (number == 40) server_.kill();
    }
    EXPECT_TRUE(eventually([&] { return recorder_->failures() == std::vector{ScreenCaptureStatus::lost}; }));
}

TEST_F(X11ScreenCaptureTest, DisplayThatStandsStillDoesNotHoldUpStop) {
    const auto window = client_.createWindow({0, 0, 200, 160}, 0);
    ASSERT_TRUE(startAndAwaitFrame());
    client_.showNumber(window, 1);
    server_.freeze();
    std::this_thread::sleep_for(50ms);
    const auto begin = std::chrono::steady_clock::now();
    source_->stopCapture();
    EXPECT_LT(std::chrono::steady_clock::now() - begin, 5s);
    server_.thaw();
}

TEST_F(X11ScreenCaptureTest, ConsumerThatBlocksForASecondLosesNothingButTime) {
    const auto window = client_.createWindow({0, 0, 200, 160}, 0);
    ASSERT_TRUE(startAndAwaitFrame());
    recorder_->onFrame([once = std::make_shared<std::once_flag>()](auto&, const auto&) {
        std::call_once(*once, [] { std::this_thread::sleep_for(1s); });
    });
    for (std::uint32_t number = 1; number <= 100; ++number) {
        client_.showNumber(window, number);
        std::this_thread::sleep_for(2ms);
    }
    EXPECT_TRUE(eventually([&] { return recorder_->hasNumber(100); }));
    EXPECT_EQ(source_->skippedFrameCount(), 0U);
}

TEST_F(X11ScreenCaptureTest, ShrinkingScreenIsFollowedWhileItIsDrawnOn) {
    const auto window = client_.createWindow({0, 0, 200, 160}, 0);
    ASSERT_TRUE(startAndAwaitFrame());
    for (std::uint32_t number = 1; number < 10; ++number) {
        client_.showNumber(window, number);
        ASSERT_TRUE(client_.resizeScreen(200 - static_cast<int>(number) * 8, 160));
    }
    EXPECT_TRUE(eventually([&] { return recorder_->last()->width == 128; }));
    EXPECT_TRUE(recorder_->failures().empty());
}

TEST_F(X11ScreenCaptureTest, StartsAndStopsLeaveNothingBehind) {
    const auto cycle = [&] {
        const auto count = recorder_->count();
        source_->startCapture();
        EXPECT_TRUE(eventually([&] { return recorder_->count() > count; }));
        source_->stopCapture();
    };
    recorder_->letGo();
    for (int i = 0; i < 5; ++i)
        cycle();
    const auto descriptors = entriesIn("/proc/self/fd");
    const auto threads = entriesIn("/proc/self/task");
    for (int i = 0; i < 50; ++i)
        cycle();
    EXPECT_EQ(entriesIn("/proc/self/fd"), descriptors);
    EXPECT_EQ(entriesIn("/proc/self/task"), threads);
}

TEST_F(X11ScreenCaptureTest, StopRightAfterStartReturns) {
    for (int i = 0; i < 50; ++i) {
        source_->startCapture();
        source_->stopCapture();
    }
}

TEST_F(X11ScreenCaptureTest, SourceThatGoesWhileItRunsStops) {
    const auto window = client_.createWindow({0, 0, 200, 160}, 0);
    ASSERT_TRUE(startAndAwaitFrame());
    source_.reset();
    const auto count = recorder_->count();
    client_.showNumber(window, 1);
    std::this_thread::sleep_for(100ms);
    EXPECT_EQ(recorder_->count(), count);
    source_ = screen_.createSource({200, 160}, MediaTime::make(1, 60));
}

TEST_F(X11ScreenCaptureTest, TimeIsThatOfTheDrawingAlsoWhenTheFrameHadToWait) {
    const auto slow = screen_.createSource({200, 160}, MediaTime::make(1, 2));
    const auto recorder = std::make_shared<test::FrameRecorder>();
    slow->setDelegate(recorder);
    const auto window = client_.createWindow({0, 0, 200, 160}, 0);
    slow->startCapture();
    ASSERT_TRUE(eventually([&] { return recorder->count() > 0; }));
    client_.showNumber(window, 1);
    std::this_thread::sleep_for(50ms);
    const auto drawn = std::chrono::steady_clock::now().time_since_epoch();
    client_.showNumber(window, 2);
    ASSERT_TRUE(eventually([&] { return recorder->hasNumber(2); }));
    const auto late = std::chrono::nanoseconds(recorder->last()->time.value) - drawn;
    EXPECT_LT(std::chrono::abs(late), 25ms) << "half an interval would be 250 ms";
    slow->stopCapture();
}

TEST_F(X11ScreenCaptureTest, NativeOrientationIsThatOfThePanel) {
    EXPECT_EQ(nativeScreenOrientation(server_.display()), 90.0F);
    const test::XvfbServer portrait(108, 192);
    EXPECT_EQ(nativeScreenOrientation(portrait.display()), 0.0F);
    EXPECT_EQ(nativeScreenOrientation(":4711"), std::nullopt);
}

TEST_F(X11ScreenCaptureTest, NativeOrientationStaysWhenTheScreenTurns) {
    ASSERT_TRUE(client_.resizeScreen(100, 160));
    EXPECT_EQ(nativeScreenOrientation(server_.display()), 90.0F);
}

TEST_F(X11ScreenCaptureTest, TurningBackAndForthIsFollowedWithFramesOfEachShape) {
    const auto window = client_.createWindow({0, 0, 200, 160}, 0);
    ASSERT_TRUE(startAndAwaitFrame());
    client_.movePointer(0, 0);  // where it hides nothing of a number
    std::uint32_t number = 0;
    for (const auto& [width, height] : {std::pair{120, 160}, {160, 120}, {122, 160}}) {
        ASSERT_TRUE(client_.resizeScreen(width, height));
        client_.place(window, {0, 0, width, height});
        client_.showNumber(window, ++number);
        ASSERT_TRUE(eventually([&] { return recorder_->hasNumber(number); }));
        EXPECT_EQ(recorder_->last()->width, static_cast<std::uint32_t>(width));
        EXPECT_EQ(recorder_->last()->height, static_cast<std::uint32_t>(height));
    }
    EXPECT_TRUE(recorder_->failures().empty());
}

}  // namespace
}  // namespace kelvo::x11
