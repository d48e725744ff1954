#include "base/KVError.h"
#include "tools/kelvoctl/JsonText.h"

#include <gtest/gtest.h>

namespace kelvo::ctl {
namespace {

TEST(JsonTextTest, EveryKindOfValueHasItsForm) {
    EXPECT_EQ(jsonText({}), "null");
    EXPECT_EQ(jsonText(true), "true");
    EXPECT_EQ(jsonText(-3), "-3");
    EXPECT_EQ(jsonText(~std::uint64_t{0}), "18446744073709551615");
    EXPECT_EQ(jsonText(1.5), "1.5");
    EXPECT_EQ(jsonText("a\"\n"), R"("a\"\n")");
    EXPECT_EQ(jsonText(URL("https://x")), R"("https://x")");
    EXPECT_EQ(jsonText(Date{1500000000}), "1.5");
    EXPECT_EQ(jsonText(Array{1, Array(), Dictionary()}), "[1,[],{}]");
    EXPECT_EQ(jsonText(KVError("d", -5, {{std::string(kLocalizedDescriptionKey), "t"}})),
              R"({"domain":"d","code":-5,"description":"t"})");
}

TEST(JsonTextTest, KeysKeepTheirOrder) {
    EXPECT_EQ(jsonText(Dictionary{{"b", 1}, {"a", 2}}), R"({"b":1,"a":2})");
}

TEST(JsonTextTest, BytesAreBase64) {
    const auto bytes = [](std::string_view text) {
        const auto* first = reinterpret_cast<const std::byte*>(text.data());
        return Bytes(first, first + text.size());
    };
    EXPECT_EQ(jsonText(bytes("")), R"("")");
    EXPECT_EQ(jsonText(bytes("M")), R"("TQ==")");
    EXPECT_EQ(jsonText(bytes("Ma")), R"("TWE=")");
    EXPECT_EQ(jsonText(bytes("Man")), R"("TWFu")");
    EXPECT_EQ(jsonText(bytes("Many")), R"("TWFueQ==")");
}

TEST(JsonTextTest, TextThatIsNotUtf8IsMended) {
    EXPECT_EQ(jsonText("a\xff"), "\"a\xEF\xBF\xBD\"");
}

}  // namespace
}  // namespace kelvo::ctl
