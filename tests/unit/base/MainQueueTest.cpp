#include "base/MainQueue.h"
#include "platform/simulated/SimulatedClock.h"
#include "support/Threads.h"

#include <atomic>
#include <future>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using namespace std::chrono_literals;
using test::BlockingCaller;

/// The time of this machine, for a loop that really waits.
class HostClock : public Clock {
  public:
    Date now() const override { return {}; }
    std::chrono::nanoseconds monotonicNow() const override {
        return std::chrono::steady_clock::now().time_since_epoch();
    }
};

class MainQueueTest : public testing::Test {
  protected:
    /// A timer that counts its runs.
    std::shared_ptr<RepeatingTimer> countRuns(std::chrono::nanoseconds period) {
        return queue_.scheduleRepeating(period, [this] { ++runs_; });
    }
    std::size_t advance(std::chrono::nanoseconds interval) {
        clock_.advance(interval);
        return queue_.runUntilIdle();
    }

    SimulatedClock clock_;
    MainQueue queue_{clock_};
    int runs_ = 0;
};

TEST_F(MainQueueTest, TasksRunInOrderWhenTheLoopRuns) {
    std::vector<int> order;
    for (int i = 0; i < 3; ++i)
        queue_.async([&order, i] { order.push_back(i); });
    EXPECT_TRUE(order.empty());
    EXPECT_EQ(queue_.runUntilIdle(), 3U);
    EXPECT_EQ(order, (std::vector<int>{0, 1, 2}));
    EXPECT_EQ(queue_.runUntilIdle(), 0U);
}

TEST_F(MainQueueTest, TaskOfATaskRunsInTheSameGo) {
    queue_.async([this] { queue_.async([this] { ++runs_; }); });
    EXPECT_EQ(queue_.runUntilIdle(), 2U);
    EXPECT_EQ(runs_, 1);
}

TEST_F(MainQueueTest, IsCurrentOnlyWhileItsLoopRunsHere) {
    bool isCurrent = false;
    EXPECT_FALSE(queue_.isCurrent());
    queue_.async([&] { isCurrent = queue_.isCurrent(); });
    queue_.runUntilIdle();
    EXPECT_TRUE(isCurrent);
    EXPECT_FALSE(queue_.isCurrent());
}

TEST_F(MainQueueTest, SyncFromAnotherThreadReturnsAfterItsTaskRanOnTheMainThread) {
    std::thread::id ranOn;
    bool sawResult = false;
    std::thread caller([&] {
        queue_.sync([&] { ranOn = std::this_thread::get_id(); });
        sawResult = ranOn != std::thread::id();
        queue_.stop();
    });
    queue_.run();
    caller.join();
    EXPECT_EQ(ranOn, std::this_thread::get_id());
    EXPECT_TRUE(sawResult);
}

TEST_F(MainQueueTest, SyncWaitsBehindTasksThatWereGivenBefore) {
    std::vector<int> order;
    queue_.async([&] { order.push_back(1); });
    BlockingCaller caller([&] { queue_.sync([&] { order.push_back(2); }); });
    caller.awaitBlocked();
    queue_.runUntilIdle();
    caller.join();
    EXPECT_EQ(order, (std::vector<int>{1, 2}));
}

TEST_F(MainQueueTest, RunGoesOnUntilItIsStopped) {
    queue_.async([this] {
        ++runs_;
        queue_.stop();
    });
    queue_.async([this] { ++runs_; });
    queue_.run();
    EXPECT_EQ(runs_, 1);  // the task behind the stop is dropped
}

TEST_F(MainQueueTest, StopFromAnotherThreadEndsAWaitingLoop) {
    BlockingCaller loop([&] { queue_.run(); });
    loop.awaitBlocked();
    queue_.stop();
    loop.join();
}

TEST_F(MainQueueTest, TaskWakesAWaitingLoop) {
    BlockingCaller loop([&] { queue_.run(); });
    loop.awaitBlocked();
    queue_.sync([this] { ++runs_; });
    queue_.stop();
    loop.join();
    EXPECT_EQ(runs_, 1);
}

TEST_F(MainQueueTest, TasksGivenAfterTheEndAreDropped) {
    queue_.stop();
    queue_.async([this] { ++runs_; });
    queue_.sync([this] { ++runs_; });
    queue_.run();
    EXPECT_EQ(queue_.runUntilIdle(), 0U);
    EXPECT_EQ(runs_, 0);
}

TEST_F(MainQueueTest, StopReleasesSyncCallersOfALoopThatNeverRan) {
    BlockingCaller caller([&] { queue_.sync([this] { ++runs_; }); });
    caller.awaitBlocked();
    queue_.stop();
    caller.join();
    EXPECT_EQ(runs_, 0);
}

TEST_F(MainQueueTest, StopInATaskReleasesSyncCallersBehindIt) {
    queue_.async([this] { queue_.stop(); });
    BlockingCaller caller([&] { queue_.sync([this] { ++runs_; }); });
    caller.awaitBlocked();
    queue_.run();
    caller.join();
    EXPECT_EQ(runs_, 0);
}

TEST_F(MainQueueTest, StopInATestsGoReleasesSyncCallersBehindIt) {
    queue_.async([this] { queue_.stop(); });
    BlockingCaller caller([&] { queue_.sync([this] { ++runs_; }); });
    caller.awaitBlocked();
    queue_.runUntilIdle();
    caller.join();
    EXPECT_EQ(runs_, 0);
}

TEST_F(MainQueueTest, SyncCallerWhoseTaskStopsTheLoopStillWaitsForItsEnd) {
    std::promise<void> stopped;
    std::promise<void> goOn;
    std::atomic<bool> hasReturned = false;
    bool returnedEarly = true;
    BlockingCaller caller([&] {
        queue_.sync([&] {
            queue_.stop();
            stopped.set_value();
            goOn.get_future().wait();
            returnedEarly = hasReturned;
        });
        hasReturned = true;
    });
    BlockingCaller loop([&] { queue_.run(); });
    stopped.get_future().wait();
    caller.awaitBlocked();
    goOn.set_value();
    caller.join();
    loop.join();
    EXPECT_FALSE(returnedEarly);
}

TEST_F(MainQueueTest, DroppedTasksMayQueueAnotherAsTheyGo) {
    queue_.async([this] { queue_.stop(); });
    queue_.async([token = std::shared_ptr<void>(nullptr, [this](void*) {
                      queue_.async([] {});  // dropped in its turn, and no lock is held here
                      ++runs_;
                  })] {});
    queue_.run();
    EXPECT_EQ(runs_, 1);
}

TEST_F(MainQueueTest, TimerRunsOnceAPeriod) {
    const auto timer = countRuns(1s);
    EXPECT_EQ(queue_.runUntilIdle(), 0U);
    EXPECT_EQ(advance(999ms), 0U);
    EXPECT_EQ(advance(1ms), 1U);
    EXPECT_EQ(advance(1s), 1U);
    EXPECT_EQ(runs_, 2);
}

TEST_F(MainQueueTest, LateTimerSkipsTheRunsItMissed) {
    const auto timer = countRuns(1s);
    EXPECT_EQ(advance(3500ms), 1U);
    EXPECT_EQ(advance(499ms), 0U);
    EXPECT_EQ(advance(1ms), 1U);  // back on its own beat
    EXPECT_EQ(runs_, 2);
}

TEST_F(MainQueueTest, InvalidatedTimerStops) {
    const auto timer = countRuns(1s);
    advance(1s);
    timer->invalidate();
    EXPECT_FALSE(timer->isValid());
    advance(5s);
    EXPECT_EQ(runs_, 1);
}

TEST_F(MainQueueTest, TimerMayInvalidateItselfInItsTask) {
    std::shared_ptr<RepeatingTimer> timer;
    const auto token = std::make_shared<int>(0);
    timer = queue_.scheduleRepeating(1s, [&, token] {
        timer->invalidate();
        ++*token;
    });
    advance(1s);
    advance(1s);
    EXPECT_EQ(*token, 1);
    EXPECT_EQ(token.use_count(), 1);
}

TEST_F(MainQueueTest, DroppedTimerStops) {
    auto timer = countRuns(1s);
    advance(1s);
    timer.reset();
    EXPECT_EQ(advance(5s), 0U);
    EXPECT_EQ(runs_, 1);
}

TEST_F(MainQueueTest, TimerMayBeDroppedInItsTask) {
    std::shared_ptr<RepeatingTimer> timer;
    auto token = std::shared_ptr<void>(nullptr, [this](void*) { queue_.async([this] { ++runs_; }); });
    timer = queue_.scheduleRepeating(1s, [&timer, token = std::move(token)] { timer.reset(); });
    advance(1s);
    EXPECT_EQ(runs_, 1);  // what the timer held went, and no lock was held then
}

TEST_F(MainQueueTest, DueTimersRunInTheOrderOfTheirTimes) {
    std::vector<int> order;
    const auto slow = queue_.scheduleRepeating(3s, [&] { order.push_back(3); });
    const auto fast = queue_.scheduleRepeating(2s, [&] { order.push_back(2); });
    advance(3s);
    EXPECT_EQ(order, (std::vector<int>{2, 3}));
}

TEST_F(MainQueueTest, TimerMayScheduleAnother) {
    std::shared_ptr<RepeatingTimer> second;
    const auto first = queue_.scheduleRepeating(1s, [&] {
        if (!second) second = countRuns(1s);
    });
    advance(1s);
    EXPECT_EQ(runs_, 0);
    advance(1s);
    EXPECT_EQ(runs_, 1);
}

TEST_F(MainQueueTest, TasksGoBeforeDueTimers) {
    std::vector<int> order;
    const auto timer = queue_.scheduleRepeating(1s, [&] { order.push_back(2); });
    queue_.async([&] { order.push_back(1); });
    advance(1s);
    EXPECT_EQ(order, (std::vector<int>{1, 2}));
}

TEST(MainQueueOnTheHostsClockTest, WaitingLoopWakesForItsTimer) {
    const HostClock clock;
    MainQueue queue(clock);
    int runs = 0;
    const auto timer = queue.scheduleRepeating(1ms, [&] {
        if (++runs == 3) queue.stop();
    });
    queue.run();
    EXPECT_EQ(runs, 3);
}

TEST(MainQueueDeathTest, SyncFromItsOwnLoopAborts) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_DEATH(
        {
            const SimulatedClock clock;
            MainQueue queue(clock);
            queue.async([&] { queue.sync([] {}); });
            queue.runUntilIdle();
        },
        "main queue");
}

}  // namespace
}  // namespace kelvo
