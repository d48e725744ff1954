#include "base/KVError.h"
#include "base/Value.h"

#include <cmath>
#include <cstdlib>
#include <ctime>
#include <limits>
#include <type_traits>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

constexpr double kTwoTo63 = 9223372036854775808.0;
constexpr std::int64_t kLargest = std::numeric_limits<std::int64_t>::max();
constexpr std::int64_t kSmallest = std::numeric_limits<std::int64_t>::min();

class Thing : public ObjectHandle {};

std::shared_ptr<ObjectHandle> makeThing() {
    return std::make_shared<Thing>();
}

Value nestedArrays(int levels, Value innermost) {
    for (int level = 0; level < levels; ++level)
        innermost = Value(Array{std::move(innermost)});
    return innermost;
}

TEST(ValueTest, DefaultValueIsNothing) {
    EXPECT_TRUE(Value().isNothing());
    EXPECT_FALSE(Value(0).isNothing());
    EXPECT_FALSE(Value("").isNothing());
}

TEST(ValueTest, ContentIsHandedOutOnlyAsItsOwnType) {
    const Value text("text");
    ASSERT_NE(text.asString(), nullptr);
    EXPECT_EQ(*text.asString(), "text");
    EXPECT_EQ(text.asArray(), nullptr);
    EXPECT_EQ(text.asDictionary(), nullptr);
    EXPECT_EQ(text.asError(), nullptr);
    EXPECT_EQ(text.as<URL>(), nullptr);
}

TEST(ValueTest, PointerDoesNotBecomeABoolean) {
    EXPECT_FALSE((std::is_constructible_v<Value, int*>));
    EXPECT_TRUE((std::is_constructible_v<Value, const char*>));
}

TEST(ValueTest, BooleanReadsAsANumber) {
    EXPECT_EQ(Value(true).asInteger(), 1);
    EXPECT_EQ(Value(false).asInteger(), 0);
    EXPECT_EQ(Value(true).asDouble(), 1.0);
}

TEST(ValueTest, NumberReadsAsABoolean) {
    EXPECT_EQ(Value(0).asBool(), false);
    EXPECT_EQ(Value(-3).asBool(), true);
    EXPECT_EQ(Value(0.5).asBool(), true);
    EXPECT_EQ(Value(0.0).asBool(), false);
    EXPECT_EQ(Value(std::numeric_limits<std::uint64_t>::max()).asBool(), true);
}

TEST(ValueTest, DoubleIsCutTowardsZero) {
    EXPECT_EQ(Value(2.9).asInteger(), 2);
    EXPECT_EQ(Value(-2.9).asInteger(), -2);
}

TEST(ValueTest, IntegersReachTheEndsOfTheirRange) {
    EXPECT_EQ(Value(kLargest).asInteger(), kLargest);
    EXPECT_EQ(Value(kSmallest).asInteger(), kSmallest);
    EXPECT_EQ(Value(std::numeric_limits<std::uint32_t>::max()).asInteger(), 4294967295);
}

TEST(ValueTest, UnsignedNumberReadsAsAnIntegerUpToTheLargestOne) {
    EXPECT_EQ(Value(static_cast<std::uint64_t>(kLargest)).asInteger(), kLargest);
    EXPECT_EQ(Value(static_cast<std::uint64_t>(kLargest) + 1).asInteger(), std::nullopt);
    EXPECT_EQ(Value(static_cast<std::uint64_t>(kLargest) + 1).asDouble(), kTwoTo63);
}

TEST(ValueTest, DoubleBeyondTheIntegersIsNone) {
    EXPECT_EQ(Value(kTwoTo63).asInteger(), std::nullopt);
    EXPECT_EQ(Value(-kTwoTo63).asInteger(), kSmallest);
    EXPECT_EQ(Value(std::nextafter(-kTwoTo63, -1e300)).asInteger(), std::nullopt);
    EXPECT_EQ(Value(std::nextafter(kTwoTo63, 0)).asInteger(), 9223372036854774784);
}

TEST(ValueTest, NotANumberAndInfinityAreNoIntegers) {
    EXPECT_EQ(Value(std::numeric_limits<double>::quiet_NaN()).asInteger(), std::nullopt);
    EXPECT_EQ(Value(std::numeric_limits<double>::infinity()).asInteger(), std::nullopt);
    EXPECT_EQ(Value(-std::numeric_limits<double>::infinity()).asInteger(), std::nullopt);
}

TEST(ValueTest, OtherTypesAreNoNumbers) {
    for (const Value& value : {Value(), Value("1"), Value(Bytes(1)), Value(Date{1}), Value(Array{1}),
                               Value(Dictionary{}), Value(URL("a")), Value(makeThing())}) {
        EXPECT_EQ(value.asInteger(), std::nullopt) << value.description();
        EXPECT_EQ(value.asDouble(), std::nullopt) << value.description();
        EXPECT_EQ(value.asBool(), std::nullopt) << value.description();
    }
}

TEST(ValueTest, EqualityNeedsTheSameType) {
    EXPECT_EQ(Value(1), Value(std::int64_t{1}));
    EXPECT_NE(Value(1), Value(true));
    EXPECT_NE(Value(1), Value(1.0));
    EXPECT_NE(Value(1), Value(std::uint64_t{1}));
    EXPECT_NE(Value(), Value(0));
    EXPECT_EQ(Value(), Value());
    EXPECT_NE(Value("file:///a"), Value(URL("file:///a")));
}

TEST(ValueTest, ErrorsAreEqualByContent) {
    EXPECT_EQ(Value(KVError("d", 1)), Value(KVError("d", 1)));
    EXPECT_NE(Value(KVError("d", 1)), Value(KVError("d", 2)));
    EXPECT_NE(Value(KVError("d", 1)), Value("d"));
    EXPECT_NE(Value("d"), Value(KVError("d", 1)));
}

TEST(ValueTest, HandlesAreEqualByIdentity) {
    const auto thing = makeThing();
    EXPECT_EQ(Value(thing), Value(thing));
    EXPECT_NE(Value(thing), Value(makeThing()));
}

TEST(ValueTest, ArraysAndDictionariesAreEqualByTheirItems) {
    EXPECT_EQ(Value(Array{1, "a"}), Value(Array{1, "a"}));
    EXPECT_NE(Value(Array{1, "a"}), Value(Array{"a", 1}));
    EXPECT_EQ(Value(Dictionary{{"k", Array{1}}}), Value(Dictionary{{"k", Array{1}}}));
}

TEST(ValueTest, ErrorKeepsItsContentInAValue) {
    const Value value(KVError("domain", 7, {{"k", "v"}}));
    ASSERT_NE(value.asError(), nullptr);
    EXPECT_EQ(*value.asError(), KVError("domain", 7, {{"k", "v"}}));
}

TEST(ValueDescriptionTest, DescribesEveryType) {
    ::setenv("TZ", "UTC", 1);  // NOLINT(concurrency-mt-unsafe): before any thread
    ::tzset();                 // NOLINT(concurrency-mt-unsafe)
    EXPECT_EQ(Value().description(), "(none)");
    EXPECT_EQ(Value(true).description(), "1");
    EXPECT_EQ(Value(-5).description(), "-5");
    EXPECT_EQ(Value(std::uint64_t{18446744073709551615U}).description(), "18446744073709551615");
    EXPECT_EQ(Value(1.5).description(), "1.500000");
    EXPECT_EQ(Value("text").description(), "\"text\"");
    EXPECT_EQ(Value(Bytes(3)).description(), "<3 bytes>");
    EXPECT_EQ(Value(Date{0}).description(), "1970-01-01 00:00:00");
    EXPECT_EQ(Value(URL::file("/a b")).description(), "file:///a%20b");
    EXPECT_EQ(Value(KVError("domain", -3)).description(), "domain -3");
    EXPECT_EQ(Value(makeThing()).description(), "<object>");
}

TEST(ValueDescriptionTest, DescribesCollections) {
    EXPECT_EQ(Value(Array{1, "a", Array{}}).description(), "(1, \"a\", ())");
    EXPECT_EQ(Value(Dictionary{{"key", 1}, {"other", "text"}}).description(),
              "{\"key\" = 1; \"other\" = \"text\"}");
    EXPECT_EQ(Value(Dictionary{}).description(), "{}");
}

TEST(ValueDescriptionTest, EighthLevelIsShownAndTheNinthIsNot) {
    EXPECT_EQ(nestedArrays(8, 1).description(), "((((((((1))))))))");
    EXPECT_EQ(nestedArrays(9, 1).description(), "(((((((((…)))))))))");
}

TEST(ValueDescriptionTest, DeepNestingOfDictionariesIsCutToo) {
    Value value(1);
    for (int level = 0; level < 100; ++level)
        value = Value(Dictionary{{"k", std::move(value)}});
    const std::string text = value.description();
    EXPECT_NE(text.find("\"k\" = …}"), std::string::npos);
    EXPECT_LT(text.size(), 100U);
}

}  // namespace
}  // namespace kelvo
