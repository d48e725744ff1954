#include "platform/linux/x11/DesktopView.h"

#include <gtest/gtest.h>

namespace kelvo::x11 {
namespace {

constexpr DesktopArea kArea{1000, 600};

TEST(DesktopViewTest, EmptyDesktopIsSharedByNobody) {
    EXPECT_EQ(countSharing({}, kArea), 0U);
}

TEST(DesktopViewTest, WindowsSideBySideShareTheScreen) {
    EXPECT_EQ(countSharing({{1, 0, 0, 500, 600, true}, {2, 500, 0, 500, 600, false}}, kArea), 2U);
    EXPECT_EQ(countSharing({{1, 0, 0, 1000, 300, false}, {2, 0, 300, 1000, 300, true}}, kArea), 2U);
    EXPECT_EQ(
        countSharing({{1, 0, 0, 330, 600, true}, {2, 330, 0, 330, 600, false}, {3, 660, 0, 340, 600, false}},
                     kArea),
        3U);
}

TEST(DesktopViewTest, FramesAndGapsDoNotMatter) {
    EXPECT_EQ(countSharing({{1, 5, 24, 485, 570, true}, {2, 505, 24, 485, 570, false}}, kArea), 2U);
}

TEST(DesktopViewTest, WindowsOfOneProcessAreOneApplication) {
    EXPECT_EQ(countSharing({{1, 0, 0, 500, 600, true}, {1, 500, 0, 500, 600, false}}, kArea), 1U);
}

TEST(DesktopViewTest, FloatingWindowsShareNothing) {
    EXPECT_EQ(countSharing({{1, 10, 10, 300, 200, true}, {2, 400, 300, 300, 200, false}}, kArea), 1U);
    EXPECT_EQ(countSharing({{1, 0, 0, 500, 600, true}, {2, 600, 100, 300, 200, false}}, kArea), 1U);
}

TEST(DesktopViewTest, WindowThatFillsTheScreenHasItToItself) {
    EXPECT_EQ(countSharing({{2, 500, 0, 500, 600, false}, {1, 0, 0, 1000, 600, true}}, kArea), 1U);
    EXPECT_EQ(countSharing({{1, 0, 0, 1000, 600, false}, {2, 100, 100, 300, 200, true}}, kArea), 1U);
}

TEST(DesktopViewTest, OverlappingWindowsShareNothing) {
    EXPECT_EQ(countSharing({{1, 0, 0, 600, 600, true}, {2, 300, 0, 700, 600, false}}, kArea), 1U);
}

TEST(DesktopViewTest, TopmostWindowStandsForTheActiveOne) {
    EXPECT_EQ(countSharing({{1, 0, 0, 500, 600, false}, {2, 500, 0, 500, 600, false}}, kArea), 2U);
    EXPECT_EQ(countSharing({{1, 0, 0, 500, 600, false}, {2, 0, 0, 1000, 600, false}}, kArea), 1U);
}

}  // namespace
}  // namespace kelvo::x11
