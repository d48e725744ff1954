#include "platform/linux/x11/X11Screen.h"
#include "support/Eventually.h"
#include "support/FrameRecorder.h"
#include "support/x11/XClient.h"
#include "support/x11/XvfbServer.h"

#include <chrono>
#include <cstring>
#include <thread>

#include <gtest/gtest.h>

namespace kelvo::x11 {
namespace {

using namespace std::chrono_literals;
using test::eventually;
using test::XClient;

constexpr std::uint32_t kRed = 0xFF0000;
constexpr std::uint32_t kGreen = 0x00FF00;
constexpr std::uint32_t kBlue = 0x0000FF;
constexpr std::uint32_t kBlack = 0;

/// Windows of a screen of 400 by 300 pixels, recorded on a canvas of 100 by 80.
class X11Windows : public testing::Test {
  protected:
    ~X11Windows() override { source_->stopCapture(); }

    void record(std::set<std::uint32_t> windows) {
        recorder_->keepLast();
        source_->setDelegate(recorder_);
        screen_.setCloneContexts(std::move(windows));
        screen_.setMode(MirroringMode::cloneContexts);
        source_->startCapture();
    }
    std::uint32_t pixel(int x, int y) const {
        const VideoSurfaceRef surface = recorder_->lastSurface();
        if (!surface) return 0xDEAD;
        std::uint32_t value = 0;
        std::memcpy(&value, surface->pixels().data() + y * surface->geometry().bytesPerRow + x * 4, 4);
        return value & 0xFFFFFF;
    }
    bool becomes(int x, int y, std::uint32_t colour) {
        return eventually([&] { return pixel(x, y) == colour; }, 5s);
    }
    bool showsAnywhere(std::uint32_t colour) const {
        for (int y = 0; y < 80; ++y) {
            for (int x = 0; x < 100; ++x) {
                if (pixel(x, y) == colour) return true;
            }
        }
        return false;
    }

    test::XvfbServer server_{400, 300};
    XClient client_{server_.display()};
    X11Screen screen_{server_.display()};
    std::shared_ptr<test::FrameRecorder> recorder_ = std::make_shared<test::FrameRecorder>();
    std::shared_ptr<ScreenCaptureSource> source_ = screen_.createSource({100, 80}, MediaTime::make(1, 60));
};

TEST_F(X11Windows, WindowFillsTheFrameFromItsCornerWhereverItIs) {
    const auto window = client_.createWindow({150, 60, 100, 80}, kRed);
    record({window});
    EXPECT_TRUE(becomes(0, 0, kRed));
    EXPECT_TRUE(becomes(99, 79, kRed));
    EXPECT_EQ(recorder_->last()->width, 100U);
    EXPECT_EQ(recorder_->last()->height, 80U);
}

TEST_F(X11Windows, NothingElseOfTheScreenShows) {
    const auto window = client_.createWindow({150, 60, 50, 40}, kRed);
    client_.createWindow({0, 0, 400, 300}, kGreen);
    record({window});
    EXPECT_TRUE(becomes(25, 20, kRed));
    EXPECT_EQ(pixel(75, 60), kBlack);
    EXPECT_FALSE(showsAnywhere(kGreen));
}

TEST_F(X11Windows, FullyCoveredWindowIsRecordedAsItDraws) {
    const auto window = client_.createWindow({10, 10, 100, 80}, kRed);
    const auto cover = client_.createWindow({0, 0, 400, 300}, kGreen);
    record({window});
    ASSERT_TRUE(becomes(50, 40, kRed));
    for (std::uint32_t number = 1; number <= 10; ++number) {
        client_.showNumber(window, number);
        EXPECT_TRUE(eventually([&] { return recorder_->hasNumber(number); }));
        client_.fill(cover, {0, 0, 400, 300}, kGreen);
    }
    EXPECT_FALSE(showsAnywhere(kGreen));
}

TEST_F(X11Windows, DrawingOfTheCoveringWindowYieldsNoFrame) {
    const auto window = client_.createWindow({10, 10, 100, 80}, kRed);
    const auto cover = client_.createWindow({0, 0, 400, 300}, kGreen);
    record({window});
    ASSERT_TRUE(becomes(50, 40, kRed));
    std::this_thread::sleep_for(200ms);
    const auto count = recorder_->count();
    client_.fill(cover, {0, 0, 100, 100}, kBlue);
    std::this_thread::sleep_for(200ms);
    EXPECT_EQ(recorder_->count(), count);
}

TEST_F(X11Windows, WindowsLieRelativeToTheLargestInStackingOrder) {
    const auto large = client_.createWindow({100, 100, 100, 80}, kRed);
    const auto small = client_.createWindow({130, 120, 20, 20}, kBlue);
    record({large, small});
    EXPECT_TRUE(becomes(31, 21, kBlue));
    EXPECT_EQ(pixel(10, 10), kRed);
    client_.raise(large);
    EXPECT_TRUE(becomes(31, 21, kRed)) << "the small one lies below now";
}

TEST_F(X11Windows, MovedWindowIsFollowed) {
    const auto large = client_.createWindow({100, 100, 100, 80}, kRed);
    const auto small = client_.createWindow({110, 110, 20, 20}, kBlue);
    record({large, small});
    ASSERT_TRUE(becomes(11, 11, kBlue));
    client_.place(small, {160, 150, 20, 20});
    EXPECT_TRUE(becomes(61, 51, kBlue));
    EXPECT_EQ(pixel(11, 11), kRed);
}

TEST_F(X11Windows, ResizedWindowIsFollowed) {
    const auto window = client_.createWindow({100, 100, 40, 30}, kRed);
    record({window});
    ASSERT_TRUE(becomes(39, 29, kRed));
    EXPECT_EQ(pixel(60, 60), kBlack);
    client_.place(window, {100, 100, 90, 70});
    EXPECT_TRUE(becomes(89, 69, kRed));
}

TEST_F(X11Windows, LargerWindowIsScaledDownToFit) {
    const auto window = client_.createWindow({0, 0, 200, 160}, kRed);
    client_.fill(window, {100, 80, 100, 80}, kBlue);
    record({window});
    EXPECT_TRUE(becomes(75, 60, kBlue));
    EXPECT_EQ(pixel(25, 20), kRed);
}

TEST_F(X11Windows, UnmappedWindowVanishesAndComesBack) {
    const auto window = client_.createWindow({100, 100, 100, 80}, kRed);
    record({window});
    ASSERT_TRUE(becomes(50, 40, kRed));
    client_.unmap(window);
    EXPECT_TRUE(becomes(50, 40, kBlack));
    client_.map(window);
    EXPECT_TRUE(becomes(50, 40, kRed));
}

TEST_F(X11Windows, ClosedWindowVanishesAndTheOthersStay) {
    const auto large = client_.createWindow({100, 100, 100, 80}, kRed);
    const auto small = client_.createWindow({120, 120, 30, 30}, kBlue);
    record({large, small});
    ASSERT_TRUE(becomes(21, 21, kBlue));
    client_.destroy(large);
    EXPECT_TRUE(becomes(0, 0, kBlue)) << "the largest of those that are left";
    EXPECT_EQ(pixel(50, 50), kBlack);
    client_.destroy(small);
    EXPECT_TRUE(becomes(0, 0, kBlack));
}

TEST_F(X11Windows, ClosingWindowsWhileTheyAreGrabbedIsSurvived) {
    for (int round = 0; round < 20; ++round) {
        const auto window = client_.createWindow({0, 0, 100, 80}, kRed);
        if (round == 0) record({window});
        screen_.setCloneContexts({window});
        for (int i = 0; i < 5; ++i)
            client_.fill(window, {i, i, 50, 50}, kBlue);
        client_.destroy(window);
    }
    const auto last = client_.createWindow({0, 0, 100, 80}, kGreen);
    screen_.setCloneContexts({last});
    EXPECT_TRUE(becomes(50, 40, kGreen));
    EXPECT_TRUE(recorder_->failures().empty());
}

TEST_F(X11Windows, ParentThatMovesOrIsUnmappedIsFollowed) {
    const auto frame = client_.createWindow({50, 50, 120, 100}, kGreen);
    const auto window = client_.createWindow({0, 0, 100, 80}, kRed);
    const auto other = client_.createWindow({200, 100, 20, 20}, kBlue);
    client_.reparent(window, frame, 10, 15);
    record({window, other});
    ASSERT_TRUE(becomes(1, 1, kRed));
    EXPECT_FALSE(showsAnywhere(kGreen)) << "a window manager's frame is not the window";
    client_.place(frame, {180, 70, 120, 100});
    EXPECT_TRUE(becomes(200 - 190 + 1, 100 - 85 + 1, kBlue));
    client_.unmap(frame);
    EXPECT_TRUE(becomes(1, 1, kBlue)) << "only the other window is left";
}

TEST_F(X11Windows, ReparentedWindowIsFollowed) {
    const auto window = client_.createWindow({0, 0, 100, 80}, kRed);
    record({window});
    ASSERT_TRUE(becomes(50, 40, kRed));
    const auto frame = client_.createWindow({50, 50, 120, 100}, kGreen);
    client_.reparent(window, frame, 10, 15);
    client_.fill(window, {0, 0, 100, 80}, kBlue);
    EXPECT_TRUE(becomes(50, 40, kBlue));
    EXPECT_FALSE(showsAnywhere(kGreen));
}

TEST_F(X11Windows, WindowWithAlphaIsDrawnOverWhatLiesBelow) {
    const auto below = client_.createWindow({0, 0, 100, 80}, kRed);
    const auto above = client_.createWindow({0, 0, 50, 40}, 0x00000000, false, true);
    record({below, above});
    ASSERT_TRUE(becomes(80, 60, kRed));
    EXPECT_TRUE(becomes(10, 10, kRed)) << "fully transparent";
    client_.fill(above, {0, 0, 50, 40}, 0xFF0000FF);
    EXPECT_TRUE(becomes(10, 10, kBlue));
}

TEST_F(X11Windows, UnknownContextsAreNotShown) {
    const auto window = client_.createWindow({0, 0, 100, 80}, kRed);
    record({window, 0x7FFFFFF, client_.root()});
    EXPECT_TRUE(becomes(50, 40, kRed));
}

TEST_F(X11Windows, EmptySetIsABlackFrame) {
    record({});
    EXPECT_TRUE(eventually([&] { return recorder_->count() == 1; }));
    EXPECT_EQ(pixel(50, 40), kBlack);
}

TEST_F(X11Windows, CursorIsNotShown) {
    const auto window = client_.createWindow({0, 0, 100, 80}, kRed);
    client_.movePointer(50, 40);
    record({window});
    ASSERT_TRUE(becomes(0, 0, kRed));
    for (int y = 30; y < 60; ++y)
        EXPECT_EQ(pixel(50, y), kRed);
}

TEST_F(X11Windows, ContextsOfARunningSourceCanBeReplaced) {
    const auto first = client_.createWindow({0, 0, 100, 80}, kRed);
    const auto second = client_.createWindow({0, 0, 100, 80}, kBlue);
    record({first});
    ASSERT_TRUE(becomes(50, 40, kRed));
    screen_.setCloneContexts({second});
    EXPECT_TRUE(becomes(50, 40, kBlue));
    screen_.setCloneContexts({first});
    EXPECT_TRUE(becomes(50, 40, kRed));
}

}  // namespace
}  // namespace kelvo::x11
