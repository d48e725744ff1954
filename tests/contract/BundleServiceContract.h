#pragma once

#include "platform/Bundles.h"

#include <map>
#include <string>

#include <gtest/gtest.h>

namespace kelvo::test {

/// One bundle as a contract wants it. Each localization has the table "Localizable" with these texts; the
/// development language is English.
struct BundleRecipe {
    std::string identifier;
    std::optional<std::string> name;
    std::optional<std::string> displayName;
    std::map<std::string, std::map<std::string, std::string>> texts;
};

/// What every bundle service does. `World` supplies one:
///
///     struct World {
///         BundleService& bundles();
///         void addBundle(const std::string& path, const BundleRecipe& recipe);
///         void addFile(const std::string& path);                 // in the folder of a bundle
///         std::string programPath(const std::string& path);      // as `folderOfBundleOwning` takes it
///         std::int32_t livingProcess();                          // some process whose program can be told
///         std::int32_t missingProcess();
///     };
template <typename World>
class BundleServiceContract : public testing::Test {
  protected:
    BundleRef open(const BundleRecipe& recipe) {
        world.addBundle(kPath, recipe);
        return bundles.bundleAtPath(kPath);
    }

    inline static const std::string kPath = "/Applications/Example";
    World world;
    BundleService& bundles = world.bundles();
};

TYPED_TEST_SUITE_P(BundleServiceContract);

TYPED_TEST_P(BundleServiceContract, FolderThatDoesNotExistIsNoBundle) {
    EXPECT_EQ(this->bundles.bundleAtPath("/Applications/None"), nullptr);
}

TYPED_TEST_P(BundleServiceContract, BundleTellsWhatItIs) {
    const auto bundle = this->open({"com.example.app", "example", "The Example", {}});
    ASSERT_NE(bundle, nullptr);
    EXPECT_EQ(bundle->path(), this->kPath);
    EXPECT_EQ(bundle->bundleIdentifier(), "com.example.app");
    EXPECT_EQ(bundle->name(), "example");
    EXPECT_EQ(bundle->displayName(), "The Example");
}

TYPED_TEST_P(BundleServiceContract, NamesThatAreNotGivenAreNone) {
    const auto bundle = this->open({"com.example.app", std::nullopt, std::nullopt, {}});
    ASSERT_NE(bundle, nullptr);
    EXPECT_EQ(bundle->name(), std::nullopt);
    EXPECT_EQ(bundle->displayName(), std::nullopt);
    EXPECT_EQ(bundle->localizedDisplayName(), std::nullopt);
    EXPECT_TRUE(bundle->localizations().empty());
    EXPECT_TRUE(bundle->entitlements().empty());
}

TYPED_TEST_P(BundleServiceContract, BundleIsFoundByItsIdentifier) {
    this->open({"com.example.app", "example", std::nullopt, {{"en", {{"KEY", "text"}}}}});
    const auto bundle = this->bundles.bundleWithIdentifier("com.example.app");
    ASSERT_NE(bundle, nullptr);
    EXPECT_EQ(bundle->path(), this->kPath);
    EXPECT_EQ(this->bundles.bundleWithIdentifier("com.example"), nullptr);
    EXPECT_EQ(this->bundles.bundleWithIdentifier("com.example.App"), nullptr);
    EXPECT_EQ(this->bundles.bundleWithIdentifier(""), nullptr);
}

TYPED_TEST_P(BundleServiceContract, LocalizationsAreInAlphabeticalOrder) {
    const auto bundle = this->open(
        {"com.example.app", {}, {}, {{"zh-Hans", {{"K", "t"}}}, {"de", {{"K", "t"}}}, {"en", {{"K", "t"}}}}});
    ASSERT_NE(bundle, nullptr);
    EXPECT_EQ(bundle->localizations(), (std::vector<std::string>{"de", "en", "zh-Hans"}));
}

TYPED_TEST_P(BundleServiceContract, ResourceIsFoundInItsLocalizationOnly) {
    const auto bundle = this->open({"com.example.app", {}, {}, {{"en", {{"K", "t"}}}}});
    ASSERT_NE(bundle, nullptr);
    EXPECT_EQ(bundle->pathForResource("Localizable", "strings", "en"),
              this->kPath + "/en.lproj/Localizable.strings");
    EXPECT_EQ(bundle->pathForResource("Localizable", "strings", "de"), std::nullopt);
    EXPECT_EQ(bundle->pathForResource("Other", "strings", "en"), std::nullopt);
    EXPECT_EQ(bundle->pathForResource("Localizable", "json", "en"), std::nullopt);
}

TYPED_TEST_P(BundleServiceContract, TextOfABundleIsThatOfTheDevelopmentLanguage) {
    const auto bundle =
        this->open({"com.example.app", {}, {}, {{"en", {{"KEY", "text"}}}, {"de", {{"KEY", "Text"}}}}});
    ASSERT_NE(bundle, nullptr);
    EXPECT_EQ(bundle->localizedString("KEY", "Localizable"), "text");
    EXPECT_EQ(bundle->localizedString("KEY", "Other"), std::nullopt);
    EXPECT_EQ(bundle->localizedString("NONE", "Localizable"), std::nullopt);
}

TYPED_TEST_P(BundleServiceContract, FolderOfALocalizationOpensAsABundle) {
    this->open({"com.example.app", {}, {}, {{"en", {{"KEY", "text"}}}, {"de", {{"KEY", "Text"}}}}});
    const auto german = this->bundles.bundleAtPath(this->kPath + "/de.lproj");
    ASSERT_NE(german, nullptr);
    EXPECT_EQ(german->localizedString("KEY", "Localizable"), "Text");
    EXPECT_EQ(german->localizedString("NONE", "Localizable"), std::nullopt);
    EXPECT_EQ(german->bundleIdentifier(), "");
    EXPECT_EQ(this->bundles.bundleAtPath(this->kPath + "/fr.lproj"), nullptr);
}

TYPED_TEST_P(BundleServiceContract, EmptyTextIsNone) {
    const auto bundle = this->open({"com.example.app", {}, {}, {{"en", {{"KEY", ""}}}}});
    ASSERT_NE(bundle, nullptr);
    EXPECT_EQ(bundle->localizedString("KEY", "Localizable"), std::nullopt);
}

TYPED_TEST_P(BundleServiceContract, TextsKeepEveryCharacter) {
    const std::string text = "“é” 画面\n\t\"\\";
    const auto bundle = this->open({"com.example.app", {}, {}, {{"en", {{"KEY", text}}}}});
    ASSERT_NE(bundle, nullptr);
    EXPECT_EQ(bundle->localizedString("KEY", "Localizable"), text);
}

TYPED_TEST_P(BundleServiceContract, ProgramBelongsToTheBundleThatHoldsIt) {
    this->open({"com.example.app", {}, {}, {}});
    this->world.addBundle(this->kPath + "/PlugIns/Inner", {"com.example.app.inner", {}, {}, {}});
    this->world.addFile(this->kPath + "/bin/deep/app");
    this->world.addFile(this->kPath + "/PlugIns/Inner/inner");
    EXPECT_EQ(this->bundles.folderOfBundleOwning(this->world.programPath(this->kPath + "/bin/deep/app")),
              this->kPath);
    EXPECT_EQ(
        this->bundles.folderOfBundleOwning(this->world.programPath(this->kPath + "/PlugIns/Inner/inner")),
        this->kPath + "/PlugIns/Inner");
    EXPECT_EQ(this->bundles.folderOfBundleOwning(this->world.programPath("/Applications/app")), std::nullopt);
}

TYPED_TEST_P(BundleServiceContract, ProgramOfAProcessIsAnAbsolutePath) {
    const auto path = this->bundles.executablePath(this->world.livingProcess());
    ASSERT_TRUE(path);
    EXPECT_TRUE(path->starts_with('/'));
}

TYPED_TEST_P(BundleServiceContract, ProcessThatIsGoneHasNoProgram) {
    EXPECT_EQ(this->bundles.executablePath(this->world.missingProcess()), std::nullopt);
    EXPECT_EQ(this->bundles.executablePath(-1), std::nullopt);
}

REGISTER_TYPED_TEST_SUITE_P(BundleServiceContract, FolderThatDoesNotExistIsNoBundle, BundleTellsWhatItIs,
                            NamesThatAreNotGivenAreNone, BundleIsFoundByItsIdentifier,
                            LocalizationsAreInAlphabeticalOrder, ResourceIsFoundInItsLocalizationOnly,
                            TextOfABundleIsThatOfTheDevelopmentLanguage, FolderOfALocalizationOpensAsABundle,
                            EmptyTextIsNone, TextsKeepEveryCharacter, ProgramBelongsToTheBundleThatHoldsIt,
                            ProgramOfAProcessIsAnAbsolutePath, ProcessThatIsGoneHasNoProgram);

}  // namespace kelvo::test
