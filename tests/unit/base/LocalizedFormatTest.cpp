#include "base/LocalizedFormat.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

TEST(LocalizedFormatTest, TextWithoutPlaceholdersStays) {
    EXPECT_EQ(formatLocalized("plain"), "plain");
    EXPECT_EQ(formatLocalized(""), "");
}

TEST(LocalizedFormatTest, PlaceholdersTakeTheArgumentsInOrder) {
    EXPECT_EQ(formatLocalized("%@ to “%@”.", "a", "b"), "a to “b”.");
}

TEST(LocalizedFormatTest, PositionalPlaceholdersTakeTheirArgument) {
    EXPECT_EQ(formatLocalized("%2$@ von %1$@ und %2$@", "a", "b"), "b von a und b");
}

TEST(LocalizedFormatTest, PositionalPlaceholderDoesNotUseUpTheNextArgument) {
    EXPECT_EQ(formatLocalized("%2$@ %@ %@", "a", "b"), "b a b");
}

TEST(LocalizedFormatTest, TwoDigitPositionIsUnderstood) {
    EXPECT_EQ(formatLocalized("%10$@", "1", "2", "3", "4", "5", "6", "7", "8", "9", "ten"), "ten");
}

TEST(LocalizedFormatTest, PlaceholderWithoutAnArgumentIsEmpty) {
    EXPECT_EQ(formatLocalized("[%@]"), "[]");
    EXPECT_EQ(formatLocalized("[%@][%@]", "a"), "[a][]");
    EXPECT_EQ(formatLocalized("[%7$@]", "a"), "[]");
}

TEST(LocalizedFormatTest, ArgumentWithoutAPlaceholderIsLeftOut) {
    EXPECT_EQ(formatLocalized("[%@]", "a", "b"), "[a]");
    EXPECT_EQ(formatLocalized("none", "a"), "none");
}

TEST(LocalizedFormatTest, DoubledPercentSignIsOne) {
    EXPECT_EQ(formatLocalized("100%% of %@", "a"), "100% of a");
    EXPECT_EQ(formatLocalized("%%@", "a"), "%@");
    EXPECT_EQ(formatLocalized("%%%@", "a"), "%a");
}

TEST(LocalizedFormatTest, LonePercentSignAtTheEndStays) {
    EXPECT_EQ(formatLocalized("100%", "a"), "100%");
    EXPECT_EQ(formatLocalized("%"), "%");
    EXPECT_EQ(formatLocalized("%1"), "%1");
    EXPECT_EQ(formatLocalized("%1$"), "%1$");
}

TEST(LocalizedFormatTest, AnythingElseBehindAPercentSignStays) {
    EXPECT_EQ(formatLocalized("%n %s %d", "a"), "%n %s %d");
    EXPECT_EQ(formatLocalized("%0$@ %100$@ %1@ %-1$@", "a"), "%0$@ %100$@ %1@ %-1$@");
}

TEST(LocalizedFormatTest, ArgumentsAreNotFormatsThemselves) {
    EXPECT_EQ(formatLocalized("%@ %@", "%@", "%%"), "%@ %%");
}

TEST(PlaceholderCountTest, CountsOrNamesTheHighestPosition) {
    EXPECT_EQ(placeholderCount("none"), 0U);
    EXPECT_EQ(placeholderCount("%@"), 1U);
    EXPECT_EQ(placeholderCount("%@ %@"), 2U);
    EXPECT_EQ(placeholderCount("%2$@ %1$@"), 2U);
    EXPECT_EQ(placeholderCount("%1$@ %1$@"), 1U);
    EXPECT_EQ(placeholderCount("%12$@"), 12U);
    EXPECT_EQ(placeholderCount("%%@ 100% %n"), 0U);
}

}  // namespace
}  // namespace kelvo
