#include "base/SerialQueue.h"

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

}  // namespace
}  // namespace kelvo
