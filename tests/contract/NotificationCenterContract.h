#pragma once

#include "base/GlobalQueue.h"
#include "base/Guarded.h"
#include "platform/NotificationCenter.h"

#include <memory>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {

inline constexpr std::string_view kPosted = "com.example.posted";
inline constexpr std::string_view kNeverPosted = "com.example.never.posted";

/// What every notification center does. `World` supplies one:
///
///     struct World {
///         NotificationCenter& center();
///         void post(std::string_view name, std::uint64_t state);   // returns once it has reached the
///                                                                  // center: its handlers are queued
///     };
template <typename World>
class NotificationCenterContract : public testing::Test {
  protected:
    ~NotificationCenterContract() override { GlobalQueue::drain(); }

    using Runs = Guarded<std::vector<NotificationToken>>;

    NotificationToken registerFor(std::string_view name) {
        return world.center().registerForNotification(
            name, QueuePriority::normal,
            [runs = runs](NotificationToken token) { runs->with([&](auto& all) { all.push_back(token); }); });
    }
    void post(std::uint64_t state) {
        world.post(kPosted, state);
        GlobalQueue::drain();
    }

    World world;
    std::shared_ptr<Runs> runs = std::make_shared<Runs>();
};

TYPED_TEST_SUITE_P(NotificationCenterContract);

TYPED_TEST_P(NotificationCenterContract, HandlerRunsEachTimeWithItsToken) {
    const NotificationToken token = this->registerFor(kPosted);
    EXPECT_NE(token, 0);
    EXPECT_TRUE(this->runs->copy().empty());
    this->post(1);
    this->post(0);
    EXPECT_EQ(this->runs->copy(), (std::vector<NotificationToken>{token, token}));
}

TYPED_TEST_P(NotificationCenterContract, StateIsTheOneThatWasPostedLast) {
    const NotificationToken token = this->registerFor(kPosted);
    this->post(1);
    EXPECT_EQ(this->world.center().state(token), 1U);
    this->post(0);
    EXPECT_EQ(this->world.center().state(token), 0U);
}

TYPED_TEST_P(NotificationCenterContract, StateIsZeroBeforeAnyPostAndForUnknownTokens) {
    const NotificationToken token = this->registerFor(kNeverPosted);
    EXPECT_EQ(this->world.center().state(token), 0U);
    EXPECT_EQ(this->world.center().state(0), 0U);
    EXPECT_EQ(this->world.center().state(token + 1000), 0U);
}

TYPED_TEST_P(NotificationCenterContract, EveryRegistrationHasATokenOfItsOwn) {
    const NotificationToken first = this->registerFor(kPosted);
    const NotificationToken second = this->registerFor(kPosted);
    EXPECT_NE(first, second);
    this->post(1);
    EXPECT_EQ(this->runs->copy().size(), 2U);
}

TYPED_TEST_P(NotificationCenterContract, OtherNamesDoNotHearOfIt) {
    EXPECT_NE(this->registerFor(kNeverPosted), 0);
    this->post(1);
    EXPECT_TRUE(this->runs->copy().empty());
}

TYPED_TEST_P(NotificationCenterContract, RemovalEndsEveryRegistrationOfTheName) {
    this->registerFor(kPosted);
    this->registerFor(kPosted);
    this->world.center().removeObservers(kPosted);
    this->post(1);
    EXPECT_TRUE(this->runs->copy().empty());
}

TYPED_TEST_P(NotificationCenterContract, RemovalOfAnotherNameChangesNothing) {
    this->registerFor(kPosted);
    this->world.center().removeObservers("com.example.unknown");
    this->post(1);
    EXPECT_EQ(this->runs->copy().size(), 1U);
}

TYPED_TEST_P(NotificationCenterContract, NameCanBeRegisteredAgainAfterItsRemoval) {
    this->registerFor(kPosted);
    this->world.center().removeObservers(kPosted);
    const NotificationToken again = this->registerFor(kPosted);
    this->post(1);
    EXPECT_EQ(this->runs->copy(), std::vector<NotificationToken>{again});
}

TYPED_TEST_P(NotificationCenterContract, RemovedHandlerIsLetGo) {
    const std::weak_ptr<int> weak = [&] {
        auto token = std::make_shared<int>(1);
        this->world.center().registerForNotification(kPosted, QueuePriority::normal,
                                                     [token](NotificationToken) {});
        return std::weak_ptr<int>(token);
    }();
    EXPECT_FALSE(weak.expired());
    this->world.center().removeObservers(kPosted);
    GlobalQueue::drain();
    EXPECT_TRUE(weak.expired());
}

TYPED_TEST_P(NotificationCenterContract, HandlerMayRemoveItsOwnName) {
    NotificationCenter& center = this->world.center();
    center.registerForNotification(kPosted, QueuePriority::normal,
                                   [&center, runs = this->runs](NotificationToken t) {
                                       center.removeObservers(kPosted);
                                       runs->with([&](auto& all) { all.push_back(t); });
                                   });
    this->post(1);
    this->post(0);
    EXPECT_EQ(this->runs->copy().size(), 1U);
}

REGISTER_TYPED_TEST_SUITE_P(NotificationCenterContract, HandlerRunsEachTimeWithItsToken,
                            StateIsTheOneThatWasPostedLast, StateIsZeroBeforeAnyPostAndForUnknownTokens,
                            EveryRegistrationHasATokenOfItsOwn, OtherNamesDoNotHearOfIt,
                            RemovalEndsEveryRegistrationOfTheName, RemovalOfAnotherNameChangesNothing,
                            NameCanBeRegisteredAgainAfterItsRemoval, RemovedHandlerIsLetGo,
                            HandlerMayRemoveItsOwnName);

}  // namespace kelvo::test
