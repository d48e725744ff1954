#include "platform/linux/bundles/LinuxBundle.h"
#include "platform/linux/bundles/LinuxBundleService.h"
#include "platform/linux/bundles/LocaleLanguages.h"
#include "support/LogRecorder.h"
#include "support/TemporaryDirectory.h"

#include <sys/stat.h>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

class LinuxBundleTest : public testing::Test {
  protected:
    LinuxBundleService serviceFor(std::string_view language) const {
        return {std::make_shared<const DeviceRoot>(device.path(), resources.path()),
                std::make_shared<LocaleLanguages>(language, "")};
    }

    void mode(const std::string& relativePath, mode_t mode) const {
        ASSERT_EQ(::chmod((device.path() + "/" + relativePath).c_str(), mode), 0);
    }

    const test::TemporaryDirectory device;
    const test::TemporaryDirectory resources;
    LinuxBundleService service = serviceFor("en");
};

TEST_F(LinuxBundleTest, NamesComeFromTheInfoFile) {
    device.write("Applications/A.app/Info.json", R"({"identifier":"a.b","name":"a","displayName":"A"})");
    const BundleRef bundle = service.bundleAtPath("/Applications/A.app");
    ASSERT_TRUE(bundle);
    EXPECT_EQ(bundle->path(), "/Applications/A.app");
    EXPECT_EQ(bundle->bundleIdentifier(), "a.b");
    EXPECT_EQ(bundle->name(), "a");
    EXPECT_EQ(bundle->displayName(), "A");
    EXPECT_EQ(bundle->localizedDisplayName(), std::nullopt);
}

TEST_F(LinuxBundleTest, LocalizedNameIsTheUsersLanguages) {
    device.write("A/Info.json", R"({"localizedNames":{"de":"Aufnahme","en":"Recording"}})");
    EXPECT_EQ(serviceFor("de_AT").bundleAtPath("/A")->localizedDisplayName(), "Aufnahme");
    EXPECT_EQ(serviceFor("it").bundleAtPath("/A")->localizedDisplayName(), "Recording");
}

TEST_F(LinuxBundleTest, MissingFolderIsNoBundle) {
    EXPECT_EQ(service.bundleAtPath("/none"), nullptr);
}

TEST_F(LinuxBundleTest, MalformedInfoFileIsNoBundleAndIsLogged) {
    const test::LogRecorder log;
    const std::string file = device.write("A/Info.json", "{");
    EXPECT_EQ(service.bundleAtPath("/A"), nullptr);
    EXPECT_EQ(log.count(LogLevel::error, "cannot read " + file + ": not JSON at byte 2"), 1U);
}

TEST_F(LinuxBundleTest, LocalizationsAreItsFolders) {
    device.write("A/zh-Hans.lproj/Localizable.strings", "");
    device.write("A/en.lproj/Localizable.strings", "");
    device.write("A/other/x", "");
    EXPECT_THAT(service.bundleAtPath("/A")->localizations(), testing::ElementsAre("en", "zh-Hans"));
}

TEST_F(LinuxBundleTest, ResourceOfALocalizationHasItsPath) {
    device.write("A/en.lproj/Localizable.strings", "");
    const BundleRef bundle = service.bundleAtPath("/A");
    EXPECT_EQ(bundle->pathForResource("Localizable", "strings", "en"), "/A/en.lproj/Localizable.strings");
    EXPECT_EQ(bundle->pathForResource("Localizable", "strings", "fr"), std::nullopt);
}

TEST_F(LinuxBundleTest, LocalizationsFolderIsABundleWithItsOwnTable) {
    device.write("A/fr.lproj/Localizable.strings", R"("K" = "texte"; "E" = "";)");
    const BundleRef folder = service.bundleAtPath("/A/fr.lproj");
    ASSERT_TRUE(folder);
    EXPECT_EQ(folder->localizedString("K", "Localizable"), "texte");
    EXPECT_EQ(folder->localizedString("E", "Localizable"), std::nullopt) << "an empty text is none";
    EXPECT_EQ(folder->localizedString("X", "Localizable"), std::nullopt);
    EXPECT_EQ(folder->localizedString("K", "Other"), std::nullopt);
}

TEST_F(LinuxBundleTest, BundleItselfAnswersInItsDevelopmentLanguage) {
    device.write("A/Info.json", R"({"developmentLanguage":"fr"})");
    device.write("A/en.lproj/Localizable.strings", R"("K" = "text";)");
    device.write("A/fr.lproj/Localizable.strings", R"("K" = "texte";)");
    EXPECT_EQ(service.bundleAtPath("/A")->localizedString("K", "Localizable"), "texte");
}

TEST_F(LinuxBundleTest, MalformedTableIsLoggedAndHoldsNothing) {
    const test::LogRecorder log;
    const std::string file = device.write("A/en.lproj/Localizable.strings", "\"K\"");
    EXPECT_EQ(service.bundleAtPath("/A")->localizedString("K", "Localizable"), std::nullopt);
    EXPECT_EQ(log.count(LogLevel::error, "cannot read " + file + ": line 1: expected ="), 1U);
}

TEST_F(LinuxBundleTest, InstalledResourcesServeAFreshRoot) {
    resources.write("KelvoKit.framework/en.lproj/Localizable.strings", R"("K" = "text";)");
    const BundleRef bundle = service.bundleAtPath("/System/Library/Frameworks/KelvoKit.framework");
    ASSERT_TRUE(bundle);
    EXPECT_EQ(bundle->localizedString("K", "Localizable"), "text");
}

TEST_F(LinuxBundleTest, BundleIsFoundByItsIdentifier) {
    device.write("Applications/A.app/Info.json", R"({"identifier":"a"})");
    device.write("Applications/Broken.app/Info.json", "{");
    device.write("System/Applications/B.app/Info.json", R"({"identifier":"b"})");
    resources.write("K.framework/Info.json", R"({"identifier":"k"})");
    EXPECT_EQ(service.bundleWithIdentifier("a")->path(), "/Applications/A.app");
    EXPECT_EQ(service.bundleWithIdentifier("b")->path(), "/System/Applications/B.app");
    EXPECT_TRUE(service.bundleWithIdentifier("k"));
    EXPECT_EQ(service.bundleWithIdentifier("c"), nullptr);
    EXPECT_EQ(service.bundleWithIdentifier(""), nullptr);
}

class LinuxEntitlementsTest : public LinuxBundleTest {
  protected:
    LinuxEntitlementsTest() {
        device.write("A/Info.json", R"({"executable":"bin/app","entitlements":{"right":true}})");
        device.write("A/bin/app", "");
        mode("A", 0755);
        mode("A/Info.json", 0644);
        mode("A/bin/app", 0755);
    }
    bool isTrusted() { return service.bundleAtPath("/A")->entitlements().contains("right"); }
};

TEST_F(LinuxEntitlementsTest, CountWhenOnlyTheOwnerCanChangeTheBundle) {
    EXPECT_TRUE(isTrusted());
}

TEST_F(LinuxEntitlementsTest, DoNotCountWhenOthersCanWriteTheFolder) {
    mode("A", 0777);
    EXPECT_FALSE(isTrusted());
}

TEST_F(LinuxEntitlementsTest, DoNotCountWhenTheGroupCanWriteTheProgram) {
    mode("A/bin/app", 0775);
    EXPECT_FALSE(isTrusted());
}

TEST_F(LinuxEntitlementsTest, DoNotCountWhenOthersCanWriteTheInfoFile) {
    mode("A/Info.json", 0666);
    EXPECT_FALSE(isTrusted());
}

TEST_F(LinuxEntitlementsTest, DoNotCountWithoutAProgram) {
    device.write("A/Info.json", R"({"entitlements":{"right":true}})");
    EXPECT_FALSE(isTrusted());
}

TEST_F(LinuxEntitlementsTest, DoNotCountForAnotherUsersBundle) {
    if (::geteuid() != 0) GTEST_SKIP() << "only root can give a file away";
    constexpr uid_t kNobody = 65534;
    ASSERT_EQ(::chown((device.path() + "/A/bin/app").c_str(), kNobody, kNobody), 0);
    EXPECT_FALSE(isTrusted());
}

}  // namespace
}  // namespace kelvo
