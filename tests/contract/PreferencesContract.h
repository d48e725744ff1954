#pragma once

#include "platform/Preferences.h"

#include <gtest/gtest.h>

namespace kelvo::test {

/// What every store of preferences does. `World` supplies one that starts empty:
///
///     struct World {
///         Preferences& preferences();
///         void set(std::string_view key, const Value& value, std::string_view domain);
///         void remove(std::string_view key, std::string_view domain);
///     };
template <typename World>
class PreferencesContract : public testing::Test {
  protected:
    Value read(std::string_view key) { return world.preferences().value(key, kPreferencesDomain); }
    void set(std::string_view key, const Value& value) { world.set(key, value, kPreferencesDomain); }

    World world;
};

TYPED_TEST_SUITE_P(PreferencesContract);

TYPED_TEST_P(PreferencesContract, KeyThatWasNeverSetIsNothing) {
    EXPECT_TRUE(this->read("KVBitRateOverride").isNothing());
    this->set("Other", 1);
    EXPECT_TRUE(this->read("KVBitRateOverride").isNothing());
}

TYPED_TEST_P(PreferencesContract, ValuesKeepTheirTypes) {
    this->set("boolean", true);
    this->set("false", false);
    this->set("number", 6000000);
    this->set("negative", -5);
    this->set("large", std::int64_t{1} << 40);
    this->set("fraction", 1.5);
    this->set("text", "a “text”");
    EXPECT_EQ(this->read("boolean"), Value(true));
    EXPECT_EQ(this->read("false"), Value(false));
    EXPECT_EQ(this->read("number").asInteger(), 6000000);
    EXPECT_EQ(this->read("negative").asInteger(), -5);
    EXPECT_EQ(this->read("large").asInteger(), std::int64_t{1} << 40);
    EXPECT_EQ(this->read("fraction"), Value(1.5));
    EXPECT_EQ(this->read("text"), Value("a “text”"));
}

TYPED_TEST_P(PreferencesContract, ChangeIsSeenAtTheNextRead) {
    this->set("key", 1);
    EXPECT_EQ(this->read("key").asInteger(), 1);
    this->set("key", 2);
    EXPECT_EQ(this->read("key").asInteger(), 2);
    this->world.remove("key", kPreferencesDomain);
    EXPECT_TRUE(this->read("key").isNothing());
}

TYPED_TEST_P(PreferencesContract, DomainsAreApart) {
    this->set("key", 1);
    this->world.set("key", 2, "com.example.other");
    EXPECT_EQ(this->read("key").asInteger(), 1);
    EXPECT_EQ(this->world.preferences().value("key", "com.example.other").asInteger(), 2);
    EXPECT_TRUE(this->world.preferences().value("key", "com.example.none").isNothing());
}

TYPED_TEST_P(PreferencesContract, KeysAreTakenLiterally) {
    this->set("key", 1);
    EXPECT_TRUE(this->read("KEY").isNothing());
    EXPECT_TRUE(this->read("").isNothing());
}

REGISTER_TYPED_TEST_SUITE_P(PreferencesContract, KeyThatWasNeverSetIsNothing, ValuesKeepTheirTypes,
                            ChangeIsSeenAtTheNextRead, DomainsAreApart, KeysAreTakenLiterally);

}  // namespace kelvo::test
