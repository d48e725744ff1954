#include "session/ShouldStopLock.h"

#include <atomic>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

TEST(ShouldStopLock, IsFreeAtFirst) {
    ShouldStopLock lock;
    EXPECT_FALSE(lock.isTaken());
}

TEST(ShouldStopLock, IsTakenUntilItIsUnlocked) {
    ShouldStopLock lock;
    lock.lock();
    EXPECT_TRUE(lock.isTaken());
    lock.unlock();
    EXPECT_FALSE(lock.isTaken());
}

TEST(ShouldStopLock, StaysTakenWhenItsHolderLeavesItSo) {
    ShouldStopLock lock;
    lock.lock();
    lock.leaveTaken();
    EXPECT_TRUE(lock.isTaken());
    EXPECT_FALSE(lock.lockUnlessLeftTaken()) << "and frames turn away instead of waiting";
    EXPECT_TRUE(lock.isTaken());
}

TEST(ShouldStopLock, LeftTakenIsTakenOver) {
    ShouldStopLock lock;
    lock.lock();
    lock.leaveTaken();
    lock.lock();
    lock.unlock();
    EXPECT_TRUE(lock.lockUnlessLeftTaken());
    lock.unlock();
}

TEST(ShouldStopLock, WaiterTurnsAwayWhenTheHolderLeavesItTaken) {
    ShouldStopLock lock;
    lock.lock();
    std::atomic<int> answer{-1};
    std::thread waiter([&] { answer = lock.lockUnlessLeftTaken() ? 1 : 0; });
    lock.leaveTaken();
    waiter.join();
    EXPECT_EQ(answer, 0);
}

TEST(ShouldStopLock, KeepsThreadsApart) {
    ShouldStopLock lock;
    int counter = 0;
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([&, i] {
            for (int round = 0; round < 2000; ++round) {
                if (i % 2 == 0) {
                    lock.lock();
                } else {
                    ASSERT_TRUE(lock.lockUnlessLeftTaken());
                }
                ++counter;
                lock.unlock();
            }
        });
    }
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(counter, 8000);
}

}  // namespace
}  // namespace kelvo
