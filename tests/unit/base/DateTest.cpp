#include "base/Date.h"

#include <cstdlib>
#include <ctime>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using namespace std::chrono_literals;

void useTimeZone(const char* zone) {
    ::setenv("TZ", zone, 1);  // NOLINT(concurrency-mt-unsafe): tests change it before they start threads
    ::tzset();                // NOLINT(concurrency-mt-unsafe)
}

/// Local time is UTC while a test of this suite runs.
class LocalTimeTextTest : public testing::Test {
  protected:
    void SetUp() override { useTimeZone("UTC"); }
    void TearDown() override { useTimeZone("UTC"); }
};

TEST(DateTest, SecondsAreTakenToTheNearestNanosecond) {
    EXPECT_EQ(Date::fromSecondsSince1970(1.5).nanosecondsSince1970, 1500000000);
    EXPECT_EQ(Date::fromSecondsSince1970(-0.25).nanosecondsSince1970, -250000000);
    EXPECT_DOUBLE_EQ(Date{1500000000}.secondsSince1970(), 1.5);
}

TEST(DateTest, DifferenceIsTheIntervalBetweenTwoDates) {
    EXPECT_EQ(Date{5} - Date{7}, -2ns);
    EXPECT_EQ(Date{5} + 2ns, Date{7});
    EXPECT_DOUBLE_EQ(inSeconds(1500ms), 1.5);
}

TEST(DateTest, LaterDateIsGreater) {
    EXPECT_LT(Date{1}, Date{2});
    EXPECT_EQ(Date{1}, Date{1});
}

TEST_F(LocalTimeTextTest, WritesThePatternInLocalTime) {
    const Date date = Date::fromSecondsSince1970(1700000000);
    EXPECT_EQ(localTimeText(date, "%m-%d-%Y %H:%M:%S"), "11-14-2023 22:13:20");
}

TEST_F(LocalTimeTextTest, FollowsTheTimeZone) {
    useTimeZone("XXX-2");
    EXPECT_EQ(localTimeText(Date{0}, "%Y-%m-%d %H:%M"), "1970-01-01 02:00");
}

TEST_F(LocalTimeTextTest, FractionsAreCutOffDownwards) {
    EXPECT_EQ(localTimeText(Date{1999999999}, "%H:%M:%S"), "00:00:01");
    EXPECT_EQ(localTimeText(Date{-1}, "%Y %H:%M:%S"), "1969 23:59:59");
}

TEST_F(LocalTimeTextTest, TextOf255BytesStillFits) {
    EXPECT_EQ(localTimeText(Date{0}, std::string(255, 'x').c_str()), std::string(255, 'x'));
}

TEST_F(LocalTimeTextTest, LongerTextIsEmpty) {
    EXPECT_EQ(localTimeText(Date{0}, std::string(256, 'x').c_str()), "");
}

TEST_F(LocalTimeTextTest, EmptyPatternIsEmpty) {
    EXPECT_EQ(localTimeText(Date{0}, ""), "");
}

}  // namespace
}  // namespace kelvo
