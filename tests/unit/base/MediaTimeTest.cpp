#include "base/MediaTime.h"

#include <cmath>
#include <limits>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

TEST(MediaTimeTest, DefaultTimeIsNotValid) {
    EXPECT_FALSE(MediaTime().isValid());
    EXPECT_TRUE(std::isnan(MediaTime::invalid().seconds()));
}

TEST(MediaTimeTest, TimeWithoutTimescaleIsNotValid) {
    EXPECT_FALSE(MediaTime::make(1, 0).isValid());
}

TEST(MediaTimeTest, SecondsAreValueOverTimescale) {
    EXPECT_DOUBLE_EQ(MediaTime::make(3, 2).seconds(), 1.5);
}

TEST(MediaTimeTest, SecondsAreRoundedToTheNearestUnitHalvesAwayFromZero) {
    EXPECT_EQ(MediaTime::fromSeconds(2.4, 1), MediaTime::make(2, 1));
    EXPECT_EQ(MediaTime::fromSeconds(2.5, 1), MediaTime::make(3, 1));
    EXPECT_EQ(MediaTime::fromSeconds(-2.5, 1), MediaTime::make(-3, 1));
}

TEST(MediaTimeTest, SecondsThatDoNotFitAreInvalid) {
    EXPECT_FALSE(MediaTime::fromSeconds(std::numeric_limits<double>::quiet_NaN(), 600).isValid());
    EXPECT_FALSE(MediaTime::fromSeconds(std::numeric_limits<double>::infinity(), 600).isValid());
    EXPECT_FALSE(MediaTime::fromSeconds(1e18, 1000000000).isValid());
}

TEST(MediaTimeTest, SumOfOneTimescaleKeepsIt) {
    EXPECT_EQ(MediaTime::make(1, 600) + MediaTime::make(2, 600), MediaTime::make(3, 600));
}

TEST(MediaTimeTest, DifferenceOfTwoTimescalesIsExactInTheirCommonOne) {
    EXPECT_EQ(MediaTime::make(1, 2) - MediaTime::make(1, 3), MediaTime::make(1, 6));
}

TEST(MediaTimeTest, DifferenceMayBeNegative) {
    EXPECT_EQ(MediaTime::make(1, 1) - MediaTime::make(3, 1), MediaTime::make(-2, 1));
}

TEST(MediaTimeTest, TimescalesWithoutACommonOneUseTheFiner) {
    const MediaTime sum = MediaTime::make(1, 2147483647) + MediaTime::make(1, 2147483646);
    EXPECT_EQ(sum.timescale, 2147483647);
    EXPECT_EQ(sum.value, 2);
}

TEST(MediaTimeTest, OverflowIsInvalid) {
    const MediaTime largest = MediaTime::make(std::numeric_limits<std::int64_t>::max(), 1);
    EXPECT_FALSE((largest + MediaTime::make(1, 1)).isValid());
    EXPECT_FALSE(largest.convertedTo(1000).isValid());
}

TEST(MediaTimeTest, ArithmeticWithAnInvalidTimeIsInvalid) {
    EXPECT_FALSE((MediaTime::invalid() + MediaTime::zero()).isValid());
    EXPECT_FALSE((MediaTime::zero() - MediaTime::invalid()).isValid());
}

TEST(MediaTimeTest, ConversionRoundsToNearest) {
    EXPECT_EQ(MediaTime::make(1, 3).convertedTo(1000), MediaTime::make(333, 1000));
    EXPECT_EQ(MediaTime::make(-2, 3).convertedTo(1000), MediaTime::make(-667, 1000));
}

TEST(MediaTimeTest, OrderIgnoresTheTimescale) {
    EXPECT_TRUE(compare(MediaTime::make(1, 2), MediaTime::make(500, 1000)) == 0);
    EXPECT_TRUE(compare(MediaTime::make(1, 3), MediaTime::make(1, 2)) < 0);
    EXPECT_EQ(compare(MediaTime::invalid(), MediaTime::zero()), std::partial_ordering::unordered);
}

}  // namespace
}  // namespace kelvo
