#include "platform/linux/bundles/LocaleLanguages.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using testing::ElementsAre;

std::vector<std::string> languagesOf(std::string_view list, std::string_view locale) {
    return LocaleLanguages(list, locale).preferredLanguages();
}

TEST(LocaleLanguagesTest, LocaleNameBecomesATag) {
    EXPECT_EQ(languageTag("pt_BR.UTF-8"), "pt-BR");
    EXPECT_EQ(languageTag("de_DE@euro"), "de-DE");
    EXPECT_EQ(languageTag("fr"), "fr");
}

TEST(LocaleLanguagesTest, ChineseLocalesNameTheirScript) {
    EXPECT_EQ(languageTag("zh_CN.UTF-8"), "zh-Hans-CN");
    EXPECT_EQ(languageTag("zh_TW"), "zh-Hant-TW");
    EXPECT_EQ(languageTag("zh"), "zh-Hans");
    EXPECT_EQ(languageTag("zh-Hant-HK"), "zh-Hant-HK");
}

TEST(LocaleLanguagesTest, WhatIsNoLanguageHasNoTag) {
    EXPECT_EQ(languageTag("C.UTF-8"), "");
    EXPECT_EQ(languageTag("POSIX"), "");
    EXPECT_EQ(languageTag("../../x"), "");
    EXPECT_EQ(languageTag(""), "");
}

TEST(LocaleLanguagesTest, ListComesBeforeTheLocale) {
    EXPECT_THAT(languagesOf("de_AT:fr", "en_GB.UTF-8"), ElementsAre("de-AT", "fr"));
}

TEST(LocaleLanguagesTest, WithoutAListTheLocaleDecides) {
    EXPECT_THAT(languagesOf("", "ja_JP"), ElementsAre("ja-JP"));
}

TEST(LocaleLanguagesTest, WithoutAnyLanguageItIsEnglish) {
    EXPECT_THAT(languagesOf("", "C"), ElementsAre("en"));
    EXPECT_THAT(languagesOf("::C", ""), ElementsAre("en"));
}

}  // namespace
}  // namespace kelvo
