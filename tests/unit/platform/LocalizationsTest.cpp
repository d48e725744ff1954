#include "platform/Bundles.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using Tags = std::vector<std::string>;

TEST(PreferredLocalizationsTest, ExactTagIsFound) {
    EXPECT_EQ(preferredLocalizations({"de", "en", "pt-BR"}, {"pt-BR"}), Tags{"pt-BR"});
}

TEST(PreferredLocalizationsTest, TagIsShortenedFromItsEnd) {
    EXPECT_EQ(preferredLocalizations({"en", "zh-Hans"}, {"zh-Hans-CN"}), Tags{"zh-Hans"});
    EXPECT_EQ(preferredLocalizations({"en", "pt"}, {"pt-BR"}), Tags{"pt"});
}

TEST(PreferredLocalizationsTest, ExactTagGoesBeforeTheShortened) {
    EXPECT_EQ(preferredLocalizations({"pt", "pt-BR"}, {"pt-BR"}), Tags{"pt-BR"});
}

TEST(PreferredLocalizationsTest, LongerTagOfTheBundleDoesNotServeAShorterLanguage) {
    EXPECT_EQ(preferredLocalizations({"en", "pt-BR"}, {"pt"}), Tags{"en"});
}

TEST(PreferredLocalizationsTest, KeepsTheUsersOrderAndLeavesOutWhatTheBundleLacks) {
    EXPECT_EQ(preferredLocalizations({"de", "en", "fr"}, {"fr", "xx", "de"}), (Tags{"fr", "de"}));
}

TEST(PreferredLocalizationsTest, NoLocalizationStandsTwice) {
    EXPECT_EQ(preferredLocalizations({"en", "pt"}, {"pt-BR", "pt-PT", "pt"}), Tags{"pt"});
}

TEST(PreferredLocalizationsTest, EnglishServesWhomNothingElseServes) {
    EXPECT_EQ(preferredLocalizations({"de", "en"}, {"xx"}), Tags{"en"});
    EXPECT_EQ(preferredLocalizations({"de", "en"}, {}), Tags{"en"});
}

TEST(PreferredLocalizationsTest, WithoutEnglishItIsTheFirst) {
    EXPECT_EQ(preferredLocalizations({"fr", "de"}, {"xx"}), Tags{"fr"});
}

TEST(PreferredLocalizationsTest, BundleWithoutLocalizationsHasNone) {
    EXPECT_EQ(preferredLocalizations({}, {"en"}), Tags{});
}

TEST(PreferredLocalizationsTest, StrangeTagsAreHarmless) {
    EXPECT_EQ(preferredLocalizations({"en"}, {"", "-", "--", "-en", "en--"}), Tags{"en"});
}

}  // namespace
}  // namespace kelvo
