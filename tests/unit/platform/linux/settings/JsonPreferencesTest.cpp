#include "platform/linux/settings/JsonPreferences.h"
#include "support/LogRecorder.h"
#include "support/TemporaryDirectory.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

class JsonPreferencesTest : public testing::Test {
  protected:
    void write(const std::string& content) const {
        device.write("private/var/mobile/Library/Preferences/com.quillon.kelvod.json", content);
    }
    Value read(std::string_view key) { return preferences.value(key, kPreferencesDomain); }

    const test::TemporaryDirectory device;
    const test::LogRecorder log;
    JsonPreferences preferences{std::make_shared<const DeviceRoot>(device.path(), "/none")};
};

TEST_F(JsonPreferencesTest, MissingFileHoldsNothingAndIsNotAnError) {
    EXPECT_TRUE(read("x").isNothing());
    EXPECT_TRUE(log.lines().empty());
}

TEST_F(JsonPreferencesTest, EveryKindOfValueIsRead) {
    write(
        R"({"b":false,"i":-5,"u":18446744073709551615,"d":1.5,"s":"text","a":[1,"x"],"o":{"k":true},"n":null})");
    EXPECT_EQ(read("b"), Value(false));
    EXPECT_EQ(read("i"), Value(-5));
    EXPECT_EQ(read("u"), Value(std::uint64_t{18446744073709551615U}));
    EXPECT_EQ(read("d"), Value(1.5));
    EXPECT_EQ(read("s"), Value("text"));
    EXPECT_EQ(read("a"), Value(Array{1, "x"}));
    EXPECT_EQ(read("o"), Value(Dictionary{{"k", true}}));
    EXPECT_TRUE(read("n").isNothing());
}

TEST_F(JsonPreferencesTest, ChangeOnDiskIsSeenAtTheNextRead) {
    write(R"({"x":1})");
    EXPECT_EQ(read("x"), Value(1));
    write(R"({"x":2})");
    EXPECT_EQ(read("x"), Value(2));
}

TEST_F(JsonPreferencesTest, MalformedFileIsLoggedAndHoldsNothing) {
    write("[1]");
    EXPECT_TRUE(read("x").isNothing());
    ASSERT_EQ(log.lines().size(), 1U);
    EXPECT_TRUE(
        log.texts().front().ends_with("com.quillon.kelvod.json is not a JSON object: Invalid argument"));
}

TEST_F(JsonPreferencesTest, HugeFileIsLoggedAndHoldsNothing) {
    write("{\"x\":\"" + std::string(65536, 'a') + "\"}");
    EXPECT_TRUE(read("x").isNothing());
    EXPECT_EQ(log.lines().size(), 1U);
}

TEST_F(JsonPreferencesTest, ValueThatLiesTooDeepReadsAsNothing) {
    write("{\"x\":" + std::string(30000, '[') + std::string(30000, ']') + "}");
    const Value value = read("x");
    int depth = 0;
    for (const Value* inner = &value; inner->asArray() != nullptr && !inner->asArray()->empty(); ++depth) {
        inner = &inner->asArray()->front();
    }
    EXPECT_LE(depth, 16);
}

TEST_F(JsonPreferencesTest, DomainCannotNameAnotherFolder) {
    device.write("private/var/mobile/Library/secret.json", R"({"x":1})");
    EXPECT_TRUE(preferences.value("x", "../secret").isNothing());
}

}  // namespace
}  // namespace kelvo
