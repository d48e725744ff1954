#include "base/ScreenTransform.h"

#include <array>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

struct Point {
    double x;
    double y;
    friend bool operator==(const Point&, const Point&) = default;
};

Point moved(const AffineTransform& t, Point p) {
    return {t.a * p.x + t.c * p.y + t.tx, t.b * p.x + t.d * p.y + t.ty};
}

/// Where the upper left and the upper right corner of a frame of 100 by 200 go, and its orientation.
struct Row {
    ScreenTransform transform;
    std::uint32_t orientation;
    Point upperLeft;
    Point upperRight;
};

class ScreenTransformTable : public testing::TestWithParam<Row> {};

TEST_P(ScreenTransformTable, MovesTheCornersAndNumbersTheOrientation) {
    const Row& row = GetParam();
    const AffineTransform transform = affineTransform(row.transform, {100, 200});
    EXPECT_EQ(moved(transform, {0, 0}), row.upperLeft);
    EXPECT_EQ(moved(transform, {100, 0}), row.upperRight);
    EXPECT_EQ(imageOrientation(row.transform), row.orientation);
}

INSTANTIATE_TEST_SUITE_P(
    AllEight, ScreenTransformTable,
    testing::Values(Row{{0, false}, 1, {0, 0}, {100, 0}}, Row{{1, false}, 6, {200, 0}, {200, 100}},
                    Row{{2, false}, 3, {100, 200}, {0, 200}}, Row{{3, false}, 8, {0, 100}, {0, 0}},
                    Row{{0, true}, 2, {100, 0}, {0, 0}}, Row{{1, true}, 7, {200, 100}, {200, 0}},
                    Row{{2, true}, 4, {0, 200}, {100, 200}}, Row{{3, true}, 5, {0, 0}, {0, 100}}));

TEST(ScreenTransform, UprightFrameIsNotMoved) {
    EXPECT_EQ(affineTransform({}, {1080, 1920}), AffineTransform());
}

TEST(ScreenTransform, FourQuarterTurnsAreNone) {
    EXPECT_EQ(affineTransform({4, false}, {100, 200}), AffineTransform());
    EXPECT_EQ(imageOrientation({4, false}), 1U);
}

TEST(Geometry, PicturesAreScaledDownToFitButNeverEnlarged) {
    EXPECT_EQ(scaleToFit({100, 100}, {200, 200}), 1);
    EXPECT_EQ(scaleToFit({400, 100}, {200, 200}), 0.5);
    EXPECT_EQ(scaleToFit({400, 1000}, {200, 200}), 0.2);
}

}  // namespace
}  // namespace kelvo
