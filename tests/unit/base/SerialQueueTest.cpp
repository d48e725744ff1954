#include "base/Guarded.h"
#include "base/SerialQueue.h"
#include "support/Eventually.h"
#include "support/Threads.h"

#include <algorithm>
#include <array>
#include <future>
#include <memory>
#include <pthread.h>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using test::BlockingCaller;
using Order = std::vector<int>;

/// Keeps a queue busy until it is told to let go.
class Occupant {
  public:
    explicit Occupant(SerialQueue& queue) {
        queue.async([release = release_.get_future().share()] { release.wait(); });
    }
    void leave() { release_.set_value(); }

  private:
    std::promise<void> release_;
};

std::string currentThreadName() {
    std::array<char, 16> name{};
    ::pthread_getname_np(::pthread_self(), name.data(), name.size());
    return name.data();
}

TEST(SerialQueueTest, TasksRunInTheOrderInWhichTheyWereGiven) {
    SerialQueue queue("test.order");
    Order order;
    for (int i = 0; i < 100; ++i)
        queue.async([&order, i] { order.push_back(i); });
    queue.sync([] {});
    ASSERT_EQ(order.size(), 100U);
    EXPECT_TRUE(std::is_sorted(order.begin(), order.end()));
}

TEST(SerialQueueTest, SyncReturnsAfterItsTask) {
    SerialQueue queue("test.sync");
    bool hasRun = false;
    queue.sync([&] { hasRun = true; });
    EXPECT_TRUE(hasRun);
}

TEST(SerialQueueTest, SyncRunsOnTheCallersThreadAndAsyncOnTheQueues) {
    SerialQueue queue("test.threads");
    std::thread::id asyncThread;
    std::thread::id syncThread;
    queue.async([&] { asyncThread = std::this_thread::get_id(); });
    queue.sync([&] { syncThread = std::this_thread::get_id(); });
    EXPECT_EQ(syncThread, std::this_thread::get_id());
    EXPECT_NE(asyncThread, std::this_thread::get_id());
}

TEST(SerialQueueTest, ThreadCarriesTheLastBytesOfTheLabel) {
    SerialQueue queue("com.quillon.kelvod.recording-queue");
    std::string name;
    queue.async([&] { name = currentThreadName(); });
    queue.sync([] {});
    EXPECT_EQ(name, "recording-queue");
    EXPECT_EQ(queue.label(), "com.quillon.kelvod.recording-queue");
}

TEST(SerialQueueTest, ShortLabelIsTheWholeName) {
    SerialQueue queue("short");
    std::string name;
    queue.async([&] { name = currentThreadName(); });
    queue.sync([] {});
    EXPECT_EQ(name, "short");
}

TEST(SerialQueueTest, SyncWaitsForWhatWasQueuedBefore) {
    SerialQueue queue("test.before");
    Guarded<Order> order;
    Occupant occupant(queue);
    queue.async([&] { order.with([](Order& o) { o.push_back(1); }); });
    BlockingCaller caller([&] { queue.sync([&] { order.with([](Order& o) { o.push_back(2); }); }); });
    caller.awaitBlocked();
    EXPECT_TRUE(order.copy().empty());
    occupant.leave();
    caller.join();
    EXPECT_EQ(order.copy(), (Order{1, 2}));
}

TEST(SerialQueueTest, AsyncDoesNotOvertakeAWaitingSync) {
    SerialQueue queue("test.overtake");
    Order order;
    Occupant occupant(queue);
    BlockingCaller caller([&] { queue.sync([&] { order.push_back(1); }); });
    caller.awaitBlocked();
    queue.async([&] { order.push_back(2); });
    BlockingCaller second([&] { queue.sync([&] { order.push_back(3); }); });
    second.awaitBlocked();
    occupant.leave();
    caller.join();
    second.join();
    EXPECT_EQ(order, (Order{1, 2, 3}));
}

TEST(SerialQueueTest, EachCallersTasksKeepTheirOrderUnderContention) {
    constexpr int kCallers = 4;
    constexpr int kTasks = 500;
    SerialQueue queue("test.contention");
    std::array<Order, kCallers> orders;  // touched by tasks of the queue only, which never run side by side
    std::vector<std::thread> callers;
    callers.reserve(orders.size());
    for (Order& order : orders) {
        callers.emplace_back([&queue, &order] {
            for (int i = 0; i < kTasks; ++i) {
                const auto task = [&order, i] { order.push_back(i); };
                i % 3 == 0 ? queue.sync(task) : queue.async(task);
            }
        });
    }
    for (std::thread& caller : callers)
        caller.join();
    queue.sync([] {});
    for (const Order& order : orders) {
        EXPECT_EQ(order.size(), static_cast<std::size_t>(kTasks));
        EXPECT_TRUE(std::is_sorted(order.begin(), order.end()));
    }
}

TEST(SerialQueueTest, TaskMayQueueAnother) {
    SerialQueue queue("test.nested");
    Order order;
    std::promise<void> done;
    queue.async([&] {
        queue.async([&] {
            order.push_back(2);
            done.set_value();
        });
        order.push_back(1);
    });
    done.get_future().wait();
    EXPECT_EQ(order, (Order{1, 2}));
}

TEST(SerialQueueTest, SyncTaskMayQueueAnother) {
    SerialQueue queue("test.nested.sync");
    Order order;
    queue.sync([&] {
        queue.async([&] { order.push_back(2); });
        order.push_back(1);
    });
    queue.sync([] {});
    EXPECT_EQ(order, (Order{1, 2}));
}

TEST(SerialQueueTest, KnowsWhetherTheCallerRunsOnIt) {
    SerialQueue queue("test.current");
    SerialQueue other("test.other");
    EXPECT_FALSE(queue.isCurrent());
    bool inAsync = false;
    bool inSync = false;
    bool throughOther = false;
    bool otherInQueue = true;
    queue.async([&] { inAsync = queue.isCurrent(); });
    queue.sync([&] {
        inSync = queue.isCurrent();
        otherInQueue = other.isCurrent();
        other.sync([&] { throughOther = queue.isCurrent(); });
    });
    EXPECT_TRUE(inAsync && inSync && throughOther);
    EXPECT_FALSE(otherInQueue);
    EXPECT_FALSE(queue.isCurrent());
}

TEST(SerialQueueTest, DestructionRunsWhatIsQueued) {
    int count = 0;
    {
        SerialQueue queue("test.destruction");
        Occupant occupant(queue);
        for (int i = 0; i < 10; ++i)
            queue.async([&] { ++count; });
        occupant.leave();
    }
    EXPECT_EQ(count, 10);
}

TEST(SerialQueueTest, DestructionOfAnUnusedQueueIsNothing) {
    const SerialQueue queue("test.unused");
}

TEST(SerialQueueTest, LastReferenceMayGoInATaskAndTheRestStillRuns) {
    auto queue = std::make_shared<SerialQueue>("test.last");
    std::promise<void> done;
    Occupant occupant(*queue);
    queue->async([&queue] { queue.reset(); });
    queue->async([&done] { done.set_value(); });
    occupant.leave();
    done.get_future().wait();
}

TEST(SerialQueueTest, LastReferenceMayGoInASyncTaskAndTheRestStillRuns) {
    auto queue = std::make_shared<SerialQueue>("test.last.sync");
    std::promise<void> done;
    queue->async([] {});
    queue->sync([&] {
        queue->async([&done] { done.set_value(); });
        queue.reset();
    });
    done.get_future().wait();
}

TEST(SerialQueueTest, LastReferenceMayGoWithTheTaskThatHoldsIt) {
    auto queue = std::make_shared<SerialQueue>("test.captured");
    std::promise<void> gone;
    auto token = std::shared_ptr<void>(nullptr, [&gone](void*) { gone.set_value(); });
    SerialQueue& reference = *queue;
    reference.async([queue = std::move(queue), token = std::move(token)] {});
    gone.get_future().wait();
}

TEST(SerialQueueTest, WhatATaskHoldsGoesBeforeTheNextTaskRuns) {
    SerialQueue queue("test.captures");
    bool isGone = false;
    bool wasGoneBefore = false;
    queue.async([token = std::shared_ptr<void>(nullptr, [&](void*) { isGone = true; })] {});
    queue.async([&] { wasGoneBefore = isGone; });
    queue.sync([] {});
    EXPECT_TRUE(wasGoneBefore);
}

TEST(SerialQueueTest, QueuesRunSideBySide) {
    SerialQueue first("test.first");
    SerialQueue second("test.second");
    Occupant occupant(first);
    bool hasRun = false;
    second.sync([&] { hasRun = true; });
    EXPECT_TRUE(hasRun);
    occupant.leave();
}

class SerialQueueDeathTest : public testing::Test {
  protected:
    void SetUp() override { GTEST_FLAG_SET(death_test_style, "threadsafe"); }
};

TEST_F(SerialQueueDeathTest, SyncOntoItselfAbortsWithTheLabel) {
    EXPECT_DEATH(
        {
            SerialQueue queue("com.quillon.self");
            queue.sync([&] { queue.sync([] {}); });
        },
        "com\\.quillon\\.self");
}

TEST_F(SerialQueueDeathTest, SyncOntoItselfFromAnAsyncTaskAborts) {
    EXPECT_DEATH(
        {
            SerialQueue queue("com.quillon.async");
            queue.async([&] { queue.sync([] {}); });
            queue.sync([] {});
        },
        "com\\.quillon\\.async");
}

TEST_F(SerialQueueDeathTest, SyncOntoItselfThroughAnotherQueuesSyncAborts) {
    EXPECT_DEATH(
        {
            SerialQueue queue("com.quillon.outer");
            SerialQueue other("com.quillon.inner");
            queue.async([&] { other.sync([&] { queue.sync([] {}); }); });
            queue.sync([] {});
        },
        "com\\.quillon\\.outer");
}

TEST(SerialQueueTest, RetiredQueueKeepsNoThreadAndStillRunsTasks) {
    SerialQueue queue("test.retired");
    std::weak_ptr<int> alive;
    const auto leavesAThread = [&] {
        // Ends with the thread that made it.
        queue.async([&alive] {
            thread_local std::shared_ptr<int> ofThread;
            ofThread = std::make_shared<int>();
            alive = ofThread;
        });
        queue.sync([] {});
        return !test::eventually([&] { return alive.expired(); }, std::chrono::milliseconds(100));
    };
    EXPECT_TRUE(leavesAThread());
    queue.retire();
    EXPECT_TRUE(test::eventually([&] { return alive.expired(); }));
    for (int i = 0; i < 3; ++i) {
        bool hasRun = false;
        queue.async([&] { hasRun = true; });
        queue.sync([] {});
        EXPECT_TRUE(hasRun);
    }
}

TEST(SerialQueueTest, QueueRetiresInItsOwnTaskAndGoes) {
    auto queue = std::make_unique<SerialQueue>("test.retired");
    std::promise<void> hasRun;
    queue->async([&] {
        queue->retire();
        hasRun.set_value();
    });
    hasRun.get_future().wait();
    queue.reset();
}

}  // namespace
}  // namespace kelvo
