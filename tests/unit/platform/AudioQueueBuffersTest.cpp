#include "platform/AudioQueueBuffers.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

TEST(AudioQueueBuffersTest, BufferIsLentUntilItIsEnqueuedAgainOrFreed) {
    AudioQueueBuffers buffers;
    const auto first = *buffers.allocate(10);
    const auto second = *buffers.allocate(10);
    EXPECT_EQ(buffers.lentCount(), 2U);
    EXPECT_FALSE(buffers.enqueue(first));
    EXPECT_FALSE(buffers.enqueue(second));
    EXPECT_EQ(buffers.lentCount(), 0U);
    EXPECT_EQ(buffers.takeNext(), first);
    EXPECT_EQ(buffers.takeNext(), second);
    EXPECT_EQ(buffers.takeNext(), nullptr);
    EXPECT_EQ(buffers.lentCount(), 2U);
    EXPECT_FALSE(buffers.enqueue(first));
    EXPECT_FALSE(buffers.free(second));
    EXPECT_EQ(buffers.lentCount(), 0U);
    EXPECT_EQ(buffers.enqueuedCount(), 1U);
}

}  // namespace
}  // namespace kelvo
