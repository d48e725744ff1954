#include "platform/simulated/SimulatedBundles.h"
#include "support/KVLocalization.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

const std::string kFramework = "/System/Library/Frameworks/KelvoKit.framework";

class KVLocalizationTest : public testing::Test {
  protected:
    /// Puts a text into the framework's table of one localization.
    void addText(const std::string& language, const std::string& key, const std::string& text) {
        framework.tables[language]["Localizable"][key] = text;
    }
    void install() { bundles->addBundle(kFramework, framework); }
    void prefer(std::vector<std::string> tags) { languages->setPreferredLanguages(std::move(tags)); }
    std::optional<std::string> look(const std::string& key) {
        return localization.kvLocalizedStringFromFrameworkBundleWithKey(key);
    }

    SimulatedBundleContent framework;
    std::shared_ptr<SimulatedBundles> bundles = std::make_shared<SimulatedBundles>();
    std::shared_ptr<SimulatedLanguages> languages = std::make_shared<SimulatedLanguages>();
    KVLocalization localization{bundles, languages};
};

TEST_F(KVLocalizationTest, FrameworkBundleIsOpenedOnce) {
    install();
    EXPECT_EQ(bundles->openCount(kFramework), 0);
    const BundleRef first = localization.kvFrameworkBundle();
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(first->path(), kFramework);
    EXPECT_EQ(localization.kvFrameworkBundle(), first);
    EXPECT_EQ(bundles->openCount(kFramework), 1);
}

TEST_F(KVLocalizationTest, WithoutTheFrameworkEverythingIsNone) {
    EXPECT_EQ(localization.kvFrameworkBundle(), nullptr);
    EXPECT_EQ(localization.localizedBundle(), nullptr);
    EXPECT_EQ(localization.fallbackBundle(), nullptr);
    EXPECT_EQ(look("KEY"), std::nullopt);
}

TEST_F(KVLocalizationTest, TextComesFromTheUsersLocalization) {
    addText("en", "KEY", "text");
    addText("de", "KEY", "Text");
    install();
    prefer({"de-AT", "en"});
    EXPECT_EQ(look("KEY"), "Text");
}

TEST_F(KVLocalizationTest, LocalizedBundleIsTheFolderOfTheBestLocalization) {
    addText("en", "KEY", "text");
    addText("zh-Hans", "KEY", "文");
    install();
    prefer({"zh-Hans-CN"});
    const BundleRef bundle = localization.localizedBundle();
    ASSERT_NE(bundle, nullptr);
    EXPECT_EQ(bundle->path(), kFramework + "/zh-Hans.lproj");
}

TEST_F(KVLocalizationTest, LocalizedBundleOfAFrameworkWithoutLocalizationsIsNone) {
    install();
    EXPECT_EQ(localization.localizedBundle(), nullptr);
}

TEST_F(KVLocalizationTest, LocalizedBundleMayNotExist) {
    addText("en", "KEY", "text");
    install();
    bundles->removeBundle(kFramework + "/en.lproj");
    EXPECT_EQ(localization.localizedBundle(), nullptr);
    EXPECT_EQ(look("KEY"), "text");  // the framework itself still has it
}

TEST_F(KVLocalizationTest, FallbackCutsTheRegionOff) {
    addText("en", "KEY", "text");
    addText("pt", "KEY", "texto");
    install();
    prefer({"pt-BR"});
    const BundleRef bundle = localization.fallbackBundle();
    ASSERT_NE(bundle, nullptr);
    EXPECT_EQ(bundle->path(), kFramework + "/pt.lproj");
    EXPECT_EQ(look("KEY"), "texto");
}

TEST_F(KVLocalizationTest, FallbackCutsAtTheFirstHyphen) {
    addText("zh", "KEY", "文");
    addText("zh-Hans", "OTHER", "文");
    install();
    prefer({"zh-Hans-CN"});
    EXPECT_EQ(localization.fallbackBundle()->path(), kFramework + "/zh.lproj");
}

TEST_F(KVLocalizationTest, FallbackLooksAtTheFirstLanguageOnly) {
    addText("en", "KEY", "text");
    install();
    prefer({"xx-YY", "en"});
    EXPECT_EQ(localization.fallbackBundle(), nullptr);
}

TEST_F(KVLocalizationTest, FallbackNeedsTheTable) {
    framework.tables["pt"]["Other"]["KEY"] = "texto";
    install();
    prefer({"pt-BR"});
    EXPECT_EQ(localization.fallbackBundle(), nullptr);
}

TEST_F(KVLocalizationTest, KeyMissingInTheBestLocalizationIsFoundInTheFallback) {
    addText("en", "KEY", "text");
    addText("pt", "KEY", "texto");
    addText("pt-BR", "OTHER", "outro");
    install();
    prefer({"pt-BR"});
    EXPECT_EQ(look("KEY"), "texto");
    EXPECT_EQ(look("OTHER"), "outro");
}

TEST_F(KVLocalizationTest, KeyThatOnlyTheDevelopmentLanguageHoldsIsFound) {
    addText("en", "KEY", "text");
    addText("de", "OTHER", "anderes");
    install();
    prefer({"de"});
    EXPECT_EQ(look("KEY"), "text");
}

TEST_F(KVLocalizationTest, EmptyTextIsPassedOver) {
    addText("en", "KEY", "text");
    addText("de", "KEY", "");
    install();
    prefer({"de"});
    EXPECT_EQ(look("KEY"), "text");
}

TEST_F(KVLocalizationTest, UnknownKeyIsNone) {
    addText("en", "KEY", "text");
    install();
    EXPECT_EQ(look("NONE"), std::nullopt);
    EXPECT_EQ(look(""), std::nullopt);
}

TEST_F(KVLocalizationTest, ChangeOfLanguageIsSeenAtTheNextLookUp) {
    addText("en", "KEY", "text");
    addText("de", "KEY", "Text");
    install();
    EXPECT_EQ(look("KEY"), "text");
    prefer({"de"});
    EXPECT_EQ(look("KEY"), "Text");
}

TEST_F(KVLocalizationTest, AppNameIsTheFirstThatThereIs) {
    SimulatedBundleContent content;
    content.bundleIdentifier = "com.example.app";
    const auto name = [&] {
        bundles->addBundle("/Applications/App", content);
        return localization.kvLocalizedAppNameFromBundleID("com.example.app");
    };
    EXPECT_EQ(name(), "");
    content.name = "app";
    EXPECT_EQ(name(), "app");
    content.displayName = "The App";
    EXPECT_EQ(name(), "The App");
    content.localizedDisplayName = "Die App";
    EXPECT_EQ(name(), "Die App");
    content.displayName.reset();
    EXPECT_EQ(name(), "Die App");
}

TEST_F(KVLocalizationTest, NameOfAnUnknownAppIsNone) {
    EXPECT_EQ(localization.kvLocalizedAppNameFromBundleID("com.example.app"), std::nullopt);
}

TEST_F(KVLocalizationTest, BaseIdentifierLacksTheLastComponent) {
    EXPECT_EQ(KVLocalization::baseIdentifier("x.y.z"), "x.y");
    EXPECT_EQ(KVLocalization::baseIdentifier("a.b"), "a");
    EXPECT_EQ(KVLocalization::baseIdentifier("a.b."), "a.b");
    EXPECT_EQ(KVLocalization::baseIdentifier("a..b"), "a.");
}

TEST_F(KVLocalizationTest, BaseIdentifierWithoutADotIsEmpty) {
    EXPECT_EQ(KVLocalization::baseIdentifier("abc"), "");
    EXPECT_EQ(KVLocalization::baseIdentifier(""), "");
    EXPECT_EQ(KVLocalization::baseIdentifier(".a"), "");
}

TEST_F(KVLocalizationTest, BundleOfAProcessIsTheOneThatHoldsItsProgram) {
    SimulatedBundleContent content;
    content.bundleIdentifier = "com.example.app";
    bundles->addBundle("/Applications/App", content);
    bundles->addProcess(7, "/Applications/App/bin/app");
    const BundleRef bundle = localization.bundleWithPID(7);
    ASSERT_NE(bundle, nullptr);
    EXPECT_EQ(bundle->bundleIdentifier(), "com.example.app");
}

TEST_F(KVLocalizationTest, ProcessThatIsGoneHasNoBundle) {
    EXPECT_EQ(localization.bundleWithPID(7), nullptr);
    EXPECT_EQ(localization.bundleWithPID(-1), nullptr);
}

TEST_F(KVLocalizationTest, ProgramOutsideEveryBundleHasNone) {
    bundles->addProcess(7, "/usr/bin/tool");
    EXPECT_EQ(localization.bundleWithPID(7), nullptr);
}

/// Knows which folder owns a program, but cannot open it.
class UnopenableBundles : public SimulatedBundles {
  public:
    BundleRef bundleAtPath(std::string_view) override { return nullptr; }
};

TEST(KVLocalizationFailureTest, BundleThatCannotBeOpenedIsNone) {
    const auto bundles = std::make_shared<UnopenableBundles>();
    bundles->addBundle("/Applications/App", {});
    bundles->addProcess(7, "/Applications/App/app");
    KVLocalization localization(bundles, std::make_shared<SimulatedLanguages>());
    EXPECT_EQ(localization.bundleWithPID(7), nullptr);
}

}  // namespace
}  // namespace kelvo
