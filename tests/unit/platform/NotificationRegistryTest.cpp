#include "platform/NotificationRegistry.h"

#include <future>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

constexpr int kMostThreads = 16;  // that the global queues have

TEST(NotificationRegistryTest, HandlerThatIsQueuedDoesNotRunOnceItIsRemoved) {
    NotificationRegistry registry;
    std::promise<void> gate;
    const std::shared_future<void> open = gate.get_future().share();
    for (int i = 0; i < kMostThreads; ++i)
        GlobalQueue::get(QueuePriority::high).async([open] { open.wait(); });
    bool hasRun = false;
    registry.add("a", QueuePriority::normal, [&](NotificationToken) { hasRun = true; });
    registry.post("a", 1);
    registry.remove("a");
    gate.set_value();
    GlobalQueue::drain();
    EXPECT_FALSE(hasRun);
}

TEST(NotificationRegistryTest, HandlerThatIsQueuedOutlivesTheRegistry) {
    int runs = 0;
    {
        NotificationRegistry registry;
        registry.add("a", QueuePriority::normal, [&](NotificationToken) { ++runs; });
        registry.post("a", 1);
    }
    GlobalQueue::drain();
    EXPECT_EQ(runs, 1);
}

}  // namespace
}  // namespace kelvo
