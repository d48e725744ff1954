#include "platform/linux/bundles/BundleInfo.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

std::string problemIn(const std::string& json) {
    const auto info = BundleInfo::parse(json);
    return info ? "none" : info.error().localizedDescription();
}

TEST(BundleInfoTest, EveryKnownKeyIsRead) {
    const auto info = BundleInfo::parse(R"({
        "identifier": "com.example.app", "name": "app", "displayName": "App", "executable": "bin/app",
        "icon": "icon.png", "developmentLanguage": "de", "localizedNames": {"de": "Anwendung"},
        "entitlements": {"right": true, "level": 2}, "extension": {"point": "p", "kinds": ["a", "b"]}})");
    ASSERT_TRUE(info);
    EXPECT_EQ(info->identifier, "com.example.app");
    EXPECT_EQ(info->name, "app");
    EXPECT_EQ(info->displayName, "App");
    EXPECT_EQ(info->executable, "bin/app");
    EXPECT_EQ(info->icon, "icon.png");
    EXPECT_EQ(info->developmentLanguage, "de");
    EXPECT_EQ(info->localizedNames, (Dictionary{{"de", "Anwendung"}}));
    EXPECT_EQ(*info->entitlements.find("right"), Value(true));
    EXPECT_EQ(info->entitlements.find("level")->asInteger(), 2);
    EXPECT_EQ(info->extension, (Dictionary{{"point", "p"}, {"kinds", Array{"a", "b"}}}));
}

TEST(BundleInfoTest, MissingKeysAreEmpty) {
    const auto info = BundleInfo::parse("{}");
    ASSERT_TRUE(info);
    EXPECT_EQ(info->identifier, "");
    EXPECT_EQ(info->name, std::nullopt);
    EXPECT_EQ(info->developmentLanguage, "en");
    EXPECT_TRUE(info->entitlements.empty());
}

TEST(BundleInfoTest, UnknownKeysArePassedOverWhateverTheyHold) {
    const auto info = BundleInfo::parse(
        R"({"x": {"identifier": "wrong", "entitlements": {"right": true}}, "y": [[{"name": 1}]], "z": null,
            "entitlements": {"nested": {"right": true}, "deep": [[1], {"a": 2}], "own": 1}, "identifier": "right"})");
    ASSERT_TRUE(info);
    EXPECT_EQ(info->identifier, "right");
    EXPECT_EQ(info->name, std::nullopt);
    EXPECT_EQ(info->entitlements.size(), 2U);
    EXPECT_EQ(info->entitlements.find("own")->asInteger(), 1);
    EXPECT_EQ(*info->entitlements.find("deep"), Value(Array{}));
}

TEST(BundleInfoTest, KnownKeyOfTheWrongTypeIsNamed) {
    EXPECT_EQ(problemIn(R"({"identifier": 5})"), "identifier is not a text");
    EXPECT_EQ(problemIn(R"({"name": {}})"), "name is not a text");
    EXPECT_EQ(problemIn(R"({"icon": ["a"]})"), "icon is an array");
    EXPECT_EQ(problemIn(R"({"entitlements": true})"), "entitlements is not an object");
    EXPECT_EQ(problemIn(R"({"extension": []})"), "extension is an array");
}

TEST(BundleInfoTest, AnythingButAnObjectIsRefused) {
    EXPECT_EQ(problemIn("[]"), "not an object");
    EXPECT_EQ(problemIn("5"), "not an object");
}

TEST(BundleInfoTest, TextThatIsNotJsonIsRefusedWithItsPlace) {
    EXPECT_EQ(problemIn(""), "not JSON at byte 1");
    EXPECT_EQ(problemIn("{\"a\": 1"), "not JSON at byte 8");
    EXPECT_EQ(problemIn("{\"identifier\": \"\xE9\"}"), "not JSON at byte 18");
    EXPECT_EQ(problemIn("{} {}"), "not JSON at byte 4");
}

TEST(BundleInfoTest, DeepNestingIsRefused) {
    EXPECT_EQ(problemIn("{\"x\":" + std::string(100, '[')), "nested too deeply");
    EXPECT_EQ(problemIn(std::string(100000, '[')), "not an object");
}

TEST(BundleInfoTest, EndlessTextIsRefused) {
    EXPECT_EQ(problemIn("{\"x\":\"" + std::string(4097, 'a') + "\"}"), "a text or a number is too long");
    EXPECT_EQ(problemIn("{\"x\":\"" + std::string(4096, 'a') + "\"}"), "none");
}

TEST(BundleInfoTest, EndlessNumberIsRefused) {
    EXPECT_EQ(problemIn("{\"x\":" + std::string(4097, '1') + "}"), "a text or a number is too long");
}

TEST(BundleInfoTest, TooManyEntriesAreRefused) {
    std::string json = R"({"entitlements":{)";
    for (std::size_t i = 0; i <= BundleInfo::kMostEntries; ++i) {
        json += (i > 0 ? ",\"k" : "\"k") + std::to_string(i) + "\":1";
    }
    EXPECT_EQ(problemIn(json + "}}"), "too many entries");
}

TEST(BundleInfoTest, HugeFileIsRefused) {
    EXPECT_EQ(problemIn(std::string(BundleInfo::kMostBytes + 1, ' ')), "the file is too large");
}

}  // namespace
}  // namespace kelvo
