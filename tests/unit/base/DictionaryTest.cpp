#include "base/Value.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

std::vector<std::string> keysOf(const Dictionary& dictionary) {
    std::vector<std::string> keys;
    for (const auto& [key, value] : dictionary)
        keys.push_back(key);
    return keys;
}

TEST(DictionaryTest, NewDictionaryIsEmpty) {
    EXPECT_TRUE(Dictionary().empty());
    EXPECT_EQ(Dictionary().size(), 0U);
    EXPECT_EQ(Dictionary().find("a"), nullptr);
}

TEST(DictionaryTest, KeysKeepTheOrderInWhichTheyWereFirstSet) {
    Dictionary dictionary{{"z", 1}, {"a", 2}};
    dictionary.set("m", 3);
    dictionary.set("z", 4);
    EXPECT_EQ(keysOf(dictionary), (std::vector<std::string>{"z", "a", "m"}));
    EXPECT_EQ(*dictionary.find("z"), Value(4));
}

TEST(DictionaryTest, LaterOfTwoEqualKeysInAListWins) {
    const Dictionary dictionary{{"a", 1}, {"b", 2}, {"a", 3}};
    EXPECT_EQ(dictionary, (Dictionary{{"a", 3}, {"b", 2}}));
}

TEST(DictionaryTest, RemovedKeyIsGoneAndComesBackAtTheEnd) {
    Dictionary dictionary{{"a", 1}, {"b", 2}};
    EXPECT_TRUE(dictionary.remove("a"));
    EXPECT_FALSE(dictionary.contains("a"));
    dictionary.set("a", 1);
    EXPECT_EQ(keysOf(dictionary), (std::vector<std::string>{"b", "a"}));
}

TEST(DictionaryTest, RemovalOfAMissingKeySaysSo) {
    Dictionary dictionary{{"a", 1}};
    EXPECT_FALSE(dictionary.remove("b"));
    EXPECT_EQ(dictionary.size(), 1U);
}

TEST(DictionaryTest, MergedValuesWinAndKeepThePlaceOfTheirKeys) {
    Dictionary dictionary{{"a", 1}, {"b", 2}};
    dictionary.merge({{"c", 3}, {"a", 4}});
    EXPECT_EQ(dictionary, (Dictionary{{"a", 4}, {"b", 2}, {"c", 3}}));
}

TEST(DictionaryTest, MergeWithItselfChangesNothing) {
    Dictionary dictionary{{"a", 1}, {"b", 2}};
    dictionary.merge(dictionary);
    EXPECT_EQ(dictionary, (Dictionary{{"a", 1}, {"b", 2}}));
}

TEST(DictionaryTest, EqualityIsOfEntriesInOrder) {
    EXPECT_NE((Dictionary{{"a", 1}, {"b", 2}}), (Dictionary{{"b", 2}, {"a", 1}}));
    EXPECT_NE((Dictionary{{"a", 1}}), (Dictionary{{"a", 2}}));
    EXPECT_NE((Dictionary{{"a", 1}}), (Dictionary{{"a", 1}, {"b", 2}}));
    EXPECT_EQ((Dictionary{{"a", 1}, {"b", 2}}), (Dictionary{{"a", 1}, {"b", 2}}));
}

TEST(DictionaryTest, CopiesAreIndependent) {
    const Dictionary original{{"a", 1}};
    Dictionary copy = original;
    copy.set("a", 2);
    EXPECT_EQ(*original.find("a"), Value(1));
}

}  // namespace
}  // namespace kelvo
