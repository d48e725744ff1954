#include "base/Guarded.h"

#include <memory>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

TEST(GuardedTest, StartsWithTheDefaultOrTheGivenValue) {
    EXPECT_EQ(Guarded<int>().copy(), 0);
    EXPECT_EQ(Guarded<int>(5).copy(), 5);
}

TEST(GuardedTest, AccessReturnsWhatItsFunctionReturns) {
    Guarded<std::vector<int>> guarded;
    EXPECT_EQ(guarded.with([](auto& all) {
        all.push_back(3);
        return all.size();
    }),
              1U);
    EXPECT_EQ(guarded.copy(), std::vector<int>{3});
}

TEST(GuardedTest, ExchangeReturnsWhatStoodThere) {
    Guarded<int> guarded(1);
    EXPECT_EQ(guarded.exchange(2), 1);
    guarded.set(3);
    EXPECT_EQ(guarded.copy(), 3);
}

TEST(GuardedTest, ReplacedValueIsDestroyedOutsideTheLock) {
    Guarded<std::shared_ptr<void>> guarded;
    int seen = 0;
    guarded.set(std::shared_ptr<void>(nullptr, [&](void*) { seen = guarded.copy() == nullptr ? 1 : 2; }));
    guarded.set(nullptr);  // would wait for itself forever if the old value went under the lock
    EXPECT_EQ(seen, 1);
}

TEST(GuardedTest, AccessesFromManyThreadsDoNotMeet) {
    Guarded<int> guarded;
    std::vector<std::thread> threads;
    threads.reserve(4);
    for (int thread = 0; thread < 4; ++thread) {
        threads.emplace_back([&] {
            for (int i = 0; i < 1000; ++i)
                guarded.with([](int& value) { ++value; });
        });
    }
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(guarded.copy(), 4000);
}

}  // namespace
}  // namespace kelvo
