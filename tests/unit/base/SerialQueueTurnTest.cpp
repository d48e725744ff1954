#include "base/SerialQueue.h"
#include "base/SpareTime.h"

#include <future>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

TEST(SerialQueueTurnTest, TurnIsTakenOnlyWhileNothingRunsOrWaits) {
    SerialQueue queue("test.turn");
    ASSERT_TRUE(queue.tryTakeTurn());
    EXPECT_FALSE(queue.tryTakeTurn());
    queue.runInTurn([] {});
    std::promise<void> release;
    queue.async([&, released = release.get_future().share()] { released.wait(); });
    EXPECT_FALSE(queue.tryTakeTurn());
    release.set_value();
    queue.sync([] {});
    ASSERT_TRUE(queue.tryTakeTurn());
    queue.runInTurn([] {});
}

TEST(SerialQueueTurnTest, TaskRunsOnTheCallersThreadAndBeforeWhatCameMeanwhile) {
    SerialQueue queue("test.turn");
    std::vector<int> order;
    ASSERT_TRUE(queue.tryTakeTurn());
    queue.async([&] { order.push_back(2); });
    queue.async([&] { order.push_back(3); });
    std::thread::id ranOn;
    queue.runInTurn([&] {
        ranOn = std::this_thread::get_id();
        EXPECT_TRUE(queue.isCurrent());
        order.push_back(1);
    });
    queue.sync([] {});
    EXPECT_EQ(ranOn, std::this_thread::get_id());
    EXPECT_EQ(order, (std::vector<int>{1, 2, 3}));
}

TEST(SerialQueueTurnTest, TaskMayLetTheQueueGo) {
    auto queue = std::make_unique<SerialQueue>("test.turn");
    ASSERT_TRUE(queue->tryTakeTurn());
    std::promise<void> ran;
    queue->async([&] { ran.set_value(); });
    queue->runInTurn([&] { queue.reset(); });
    ran.get_future().wait();
}

TEST(SerialQueueTurnTest, WhoeverWaitsIsNextAfterATurn) {
    SerialQueue queue("test.turn");
    ASSERT_TRUE(queue.tryTakeTurn());
    std::vector<int> order;
    std::thread waiting([&] { queue.sync([&] { order.push_back(2); }); });
    queue.runInTurn([&] { order.push_back(1); });
    waiting.join();
    EXPECT_EQ(order, (std::vector<int>{1, 2}));
}

TEST(SerialQueueTurnTest, SoonIsWhenTheThreadHasSpareTime) {
    SerialQueue queue("test.turn");
    std::vector<int> order;
    std::thread::id ranOn;
    {
        const SpareTime spare;
        queue.asyncOrSoon([&] {
            EXPECT_TRUE(queue.isCurrent());
            ranOn = std::this_thread::get_id();
            order.push_back(2);
        });
        queue.asyncOrSoon([&] { order.push_back(3); });
        order.push_back(1);
    }
    queue.sync([] {});
    EXPECT_EQ(ranOn, std::this_thread::get_id());
    EXPECT_EQ(order, (std::vector<int>{1, 2, 3}));
}

TEST(SerialQueueTurnTest, SoonIsOnTheQueuesThreadWhenNobodyHasTime) {
    SerialQueue queue("test.turn");
    std::thread::id ranOn = std::this_thread::get_id();
    queue.asyncOrSoon([&] { ranOn = std::this_thread::get_id(); });
    queue.sync([] {});
    EXPECT_NE(ranOn, std::this_thread::get_id());
}

TEST(SerialQueueTurnTest, SoonStaysBehindWhatWaitsAlready) {
    SerialQueue queue("test.turn");
    std::promise<void> release;
    std::vector<int> order;
    queue.async([&, released = release.get_future().share()] {
        released.wait();
        order.push_back(1);
    });
    {
        const SpareTime spare;
        queue.asyncOrSoon([&] { order.push_back(2); });
    }
    release.set_value();
    queue.sync([] {});
    EXPECT_EQ(order, (std::vector<int>{1, 2}));
}

TEST(SerialQueueTurnTest, QueueMayGoOnTheThreadThatIsToRunItsTask) {
    auto queue = std::make_unique<SerialQueue>("test.turn");
    queue->async([] {});
    queue->sync([] {});  // its own thread has started, and would be waited for
    std::vector<int> order;
    std::promise<void> last;
    {
        const SpareTime spare;
        queue->asyncOrSoon([&] { order.push_back(1); });
        queue->async([&] {
            order.push_back(2);
            last.set_value();
        });
        queue.reset();
        EXPECT_TRUE(order.empty());
    }
    last.get_future().wait();
    EXPECT_EQ(order, (std::vector<int>{1, 2}));
}

TEST(SerialQueueTurnTest, QueueThatGoesElsewhereWaitsForTheTaskThatIsToRun) {
    auto queue = std::make_unique<SerialQueue>("test.turn");
    queue->async([] {});
    queue->sync([] {});
    bool hasRun = false;
    std::thread other;
    {
        const SpareTime spare;
        queue->asyncOrSoon([&] { hasRun = true; });
        other = std::thread([&] {
            queue.reset();
            EXPECT_TRUE(hasRun);
        });
    }
    other.join();
}

TEST(SerialQueueTurnTest, SpareTimeIsSpentOnce) {
    SerialQueue queue("test.turn");
    SerialQueue other("test.other");
    std::thread::id otherRanOn;
    bool wasThere = true;
    {
        const SpareTime spare;
        EXPECT_TRUE(SpareTime::isThere());
        queue.asyncOrSoon([&] { wasThere = SpareTime::isThere(); });
        EXPECT_FALSE(SpareTime::isThere());
        other.asyncOrSoon([&] { otherRanOn = std::this_thread::get_id(); });
    }
    other.sync([] {});
    EXPECT_FALSE(wasThere) << "nor is there any while it is spent";
    EXPECT_FALSE(SpareTime::isThere());
    EXPECT_NE(otherRanOn, std::this_thread::get_id());
}

TEST(SerialQueueTurnTest, ScopeLeavesTheOuterOnesTime) {
    const SpareTime outer;
    { const SpareTime inner; }
    EXPECT_TRUE(SpareTime::isThere());
}

TEST(SerialQueueTurnTest, ScopeWithinAScopeHasTimeOfItsOwn) {
    SerialQueue queue("test.turn");
    SerialQueue other("test.other");
    std::vector<int> order;
    {
        const SpareTime outer;
        queue.asyncOrSoon([&] { order.push_back(2); });
        {
            const SpareTime inner;
            other.asyncOrSoon([&] { order.push_back(1); });
        }
        EXPECT_EQ(order, (std::vector<int>{1}));
    }
    EXPECT_EQ(order, (std::vector<int>{1, 2}));
}

}  // namespace
}  // namespace kelvo
