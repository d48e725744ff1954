#include "base/GlobalQueue.h"
#include "base/Guarded.h"

#include <array>
#include <atomic>
#include <future>
#include <latch>
#include <memory>
#include <pthread.h>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

constexpr std::size_t kMostThreads = 16;
using Words = std::vector<std::string>;

/// Tasks that hold all threads of the pool, until they are let go one by one.
class FullHouse {
  public:
    FullHouse() {
        for (auto& release : releases_) {
            GlobalQueue::get(QueuePriority::normal).async([this, future = release.get_future().share()] {
                started_.count_down();
                future.wait();
            });
        }
        started_.wait();
    }
    ~FullHouse() {
        while (released_ < kMostThreads)
            releaseOne();
        GlobalQueue::drain();
    }
    FullHouse(const FullHouse&) = delete;
    FullHouse& operator=(const FullHouse&) = delete;

    void releaseOne() { releases_[released_++].set_value(); }

  private:
    std::array<std::promise<void>, kMostThreads> releases_;
    std::latch started_{kMostThreads};
    std::size_t released_ = 0;
};

class GlobalQueueTest : public testing::Test {
  protected:
    void TearDown() override { GlobalQueue::drain(); }

    void add(QueuePriority priority, const std::string& word) {
        GlobalQueue::get(priority).async(
            [this, word] { words_.with([&](Words& words) { words.push_back(word); }); });
    }
    /// Returns when a task of the lowest priority has run, and with it all that waited before.
    void awaitTheLast() {
        std::promise<void> done;
        GlobalQueue::get(QueuePriority::background).async([&done] { done.set_value(); });
        done.get_future().wait();
    }
    Words words() const { return words_.copy(); }

  private:
    Guarded<Words> words_;
};

TEST_F(GlobalQueueTest, DrainWaitsForEveryTaskOfEveryPriority) {
    std::atomic<int> count = 0;
    for (const QueuePriority priority :
         {QueuePriority::high, QueuePriority::normal, QueuePriority::low, QueuePriority::background}) {
        for (int i = 0; i < 25; ++i)
            GlobalQueue::get(priority).async([&count] { ++count; });
    }
    GlobalQueue::drain();
    EXPECT_EQ(count, 100);
}

TEST_F(GlobalQueueTest, DrainWaitsForTasksThatTasksAdd) {
    std::atomic<bool> hasRun = false;
    GlobalQueue::get(QueuePriority::low).async([&] {
        GlobalQueue::get(QueuePriority::low).async([&] { hasRun = true; });
    });
    GlobalQueue::drain();
    EXPECT_TRUE(hasRun);
}

TEST_F(GlobalQueueTest, DrainOfAnIdlePoolReturns) {
    GlobalQueue::drain();
    GlobalQueue::drain();
}

TEST_F(GlobalQueueTest, WaitingTasksStartByPriority) {
    FullHouse house;
    add(QueuePriority::background, "background");
    add(QueuePriority::low, "low 1");
    add(QueuePriority::low, "low 2");
    add(QueuePriority::normal, "normal");
    add(QueuePriority::high, "high");
    EXPECT_TRUE(words().empty());  // all threads are taken
    house.releaseOne();
    awaitTheLast();
    EXPECT_EQ(words(), (Words{"high", "normal", "low 1", "low 2", "background"}));
}

TEST_F(GlobalQueueTest, TasksOfOnePriorityStartInOrder) {
    FullHouse house;
    Words expected;
    for (int i = 0; i < 20; ++i) {
        expected.push_back(std::to_string(i));
        add(QueuePriority::high, expected.back());
    }
    house.releaseOne();
    awaitTheLast();
    EXPECT_EQ(words(), expected);
}

TEST_F(GlobalQueueTest, BlockingTaskDoesNotHoldUpOthers) {
    std::promise<void> release;
    GlobalQueue::get(QueuePriority::high).async([future = release.get_future().share()] { future.wait(); });
    std::promise<void> done;
    GlobalQueue::get(QueuePriority::background).async([&done] { done.set_value(); });
    done.get_future().wait();
    release.set_value();
}

TEST_F(GlobalQueueTest, SixteenTasksRunSideBySide) {
    const FullHouse house;  // returns only when sixteen tasks have started
}

TEST_F(GlobalQueueTest, TaskMayWaitForAnotherTask) {
    std::promise<int> answer;
    std::promise<int> seen;
    GlobalQueue::get(QueuePriority::high).async([&] { seen.set_value(answer.get_future().get()); });
    GlobalQueue::get(QueuePriority::low).async([&] { answer.set_value(42); });
    EXPECT_EQ(seen.get_future().get(), 42);
}

TEST_F(GlobalQueueTest, ThreadIsNamedAfterThePriorityOfItsTask) {
    for (const auto& [priority, expected] :
         {std::pair(QueuePriority::high, "kelvo.high"), std::pair(QueuePriority::normal, "kelvo.normal"),
          std::pair(QueuePriority::low, "kelvo.low"),
          std::pair(QueuePriority::background, "kelvo.backgrnd")}) {
        std::promise<std::string> name;
        GlobalQueue::get(priority).async([&name] {
            std::array<char, 16> text{};
            ::pthread_getname_np(::pthread_self(), text.data(), text.size());
            name.set_value(text.data());
        });
        EXPECT_EQ(name.get_future().get(), expected);
    }
}

TEST_F(GlobalQueueTest, WhatATaskHoldsIsGoneAfterDrain) {
    auto token = std::make_shared<int>(1);
    const std::weak_ptr<int> weak = token;
    GlobalQueue::get(QueuePriority::normal).async([token = std::move(token)] {});
    GlobalQueue::drain();
    EXPECT_TRUE(weak.expired());
}

}  // namespace
}  // namespace kelvo
