#include "platform/linux/bundles/StringsTable.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

std::string problemIn(std::string text) {
    const auto table = StringsTable::parse(std::move(text));
    return table ? "none" : table.error().localizedDescription();
}

TEST(StringsTableTest, EntriesAreFoundByTheirKeys) {
    const auto table = StringsTable::parse("\"b\" = \"two\";\n\"a\"=\"one\";");
    ASSERT_TRUE(table);
    EXPECT_EQ(table->find("a"), "one");
    EXPECT_EQ(table->find("b"), "two");
    EXPECT_EQ(table->find("c"), std::nullopt);
    EXPECT_THAT(table->keys(), testing::ElementsAre("a", "b"));
}

TEST(StringsTableTest, CommentsAndBlanksArePassedOver) {
    const auto table =
        StringsTable::parse("// one\n/* two\n three */ \"a\" /* x */ = // y\r\n\t\"b\" ; // end");
    ASSERT_TRUE(table);
    EXPECT_EQ(table->find("a"), "b");
}

TEST(StringsTableTest, EscapesAreReplaced) {
    const auto table = StringsTable::parse(R"("a\"" = "\"\\\n\t\r\'\U00e9\u4e2d";)");
    ASSERT_TRUE(table);
    EXPECT_EQ(table->find("a\""), "\"\\\n\t\r'\u00e9\u4e2d");
}

TEST(StringsTableTest, ByteOrderMarkIsPassedOver) {
    const auto table = StringsTable::parse("\xEF\xBB\xBF\"a\"=\"b\";");
    ASSERT_TRUE(table);
    EXPECT_EQ(table->size(), 1U);
}

TEST(StringsTableTest, EmptyFileIsAnEmptyTable) {
    const auto table = StringsTable::parse("");
    ASSERT_TRUE(table);
    EXPECT_EQ(table->size(), 0U);
}

TEST(StringsTableTest, TextMaySpanLines) {
    const auto table = StringsTable::parse("\"a\"=\"x\ny\";");
    ASSERT_TRUE(table);
    EXPECT_EQ(table->find("a"), "x\ny");
}

TEST(StringsTableTest, MissingSemicolonIsNamedWithItsLine) {
    EXPECT_EQ(problemIn("\"a\"=\"b\";\n\"c\"=\"d\"\n"), "line 3: expected ;");
}

TEST(StringsTableTest, MissingEqualsSignIsNamed) {
    EXPECT_EQ(problemIn("\"a\" \"b\";"), "line 1: expected =");
}

TEST(StringsTableTest, UnquotedTextIsNamed) {
    EXPECT_EQ(problemIn("\n\na = \"b\";"), "line 3: expected a text in quotes");
}

TEST(StringsTableTest, TruncatedFileIsAnErrorWhereverItIsCut) {
    const std::string whole = R"(/* c */ "a\U00e9" = "b";)";
    for (std::size_t length = 1; length < whole.size(); ++length) {
        if (length == 7 || length == 8) continue;  // the comment alone, with and without its blank, is whole
        EXPECT_NE(problemIn(whole.substr(0, length)), "none") << whole.substr(0, length);
    }
    EXPECT_EQ(problemIn(whole), "none");
}

TEST(StringsTableTest, EmptyKeyIsRefused) {
    EXPECT_EQ(problemIn("\"\"=\"b\";"), "line 1: the key is empty");
}

TEST(StringsTableTest, KeyThatStandsTwiceIsNamed) {
    EXPECT_EQ(problemIn("\"a\"=\"b\";\"a\"=\"c\";"), "the key \"a\" stands twice");
}

TEST(StringsTableTest, OtherEncodingsAreRefused) {
    EXPECT_EQ(problemIn(std::string("\xFF\xFE\"\0a\0", 6)), "line 1: the text is not UTF-8");
    EXPECT_EQ(problemIn("\"a\"=\"\xE9\";"), "line 1: the text is not UTF-8");
    EXPECT_EQ(problemIn("\"a\"=\"\xED\xA0\x80\";"), "line 1: the text is not UTF-8") << "a lone surrogate";
    EXPECT_EQ(problemIn(std::string("\n\0", 2)), "line 2: the text is not UTF-8");
}

TEST(StringsTableTest, EscapeThatIsNoCharacterIsRefused) {
    EXPECT_EQ(problemIn(R"("a"="\Ud800";)"), "line 1: an escape that is no character");
    EXPECT_EQ(problemIn(R"("a"="\U12";)"), "line 1: an escape needs four hexadecimal digits");
    EXPECT_EQ(problemIn(R"("a"="\U0000";)"), "line 1: an escape needs four hexadecimal digits");
    EXPECT_EQ(problemIn(R"("a"="\x";)"), "line 1: an unknown escape");
}

TEST(StringsTableTest, HugeFileIsRefused) {
    EXPECT_EQ(problemIn(std::string(StringsTable::kMostBytes + 1, ' ')), "the table is too large");
}

}  // namespace
}  // namespace kelvo
