#include "platform/linux/pulse/BlockRing.h"
#include "platform/linux/pulse/Ticker.h"

#include <atomic>
#include <future>
#include <semaphore>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::pulse {
namespace {

using namespace std::chrono_literals;

TEST(BlockRingTest, BlocksComeOutInOrder) {
    BlockRing ring;
    BlockRing::Block block;
    EXPECT_FALSE(ring.take(block));
    ring.put(1s, std::vector<std::int16_t>{1, 2}, 1000);
    ring.put(2s, std::vector<std::int16_t>{3}, 1000);
    ASSERT_TRUE(ring.take(block));
    EXPECT_EQ(block.moment, 1s);
    EXPECT_EQ(block.count, 2U);
    EXPECT_EQ(block.content()[1], 2);
    ASSERT_TRUE(ring.take(block));
    EXPECT_EQ(block.moment, 2s);
    EXPECT_FALSE(ring.take(block));
}

TEST(BlockRingTest, LongSoundIsCutIntoBlocksThatFollow) {
    BlockRing ring;
    BlockRing::Block block;
    ring.put(1s, std::vector<std::int16_t>(BlockRing::kBlockSize + 5, 7), 1000);
    ASSERT_TRUE(ring.take(block));
    EXPECT_EQ(block.count, BlockRing::kBlockSize);
    ASSERT_TRUE(ring.take(block));
    EXPECT_EQ(block.count, 5U);
    EXPECT_EQ(block.moment, 1s + BlockRing::kBlockSize * 1ms);
}

TEST(BlockRingTest, FullRingDropsTheNewest) {
    BlockRing ring;
    for (std::size_t i = 0; i < BlockRing::kBlockCount + 3; ++i)
        ring.put(i * 1s, std::vector<std::int16_t>{1}, 1000);
    BlockRing::Block block;
    std::size_t count = 0;
    while (ring.take(block)) {
        EXPECT_EQ(block.moment, count * 1s);
        ++count;
    }
    EXPECT_EQ(count, BlockRing::kBlockCount - BlockRing::kEventRoom);
}

TEST(BlockRingTest, EventsKeepTheirPlaceAndFindRoomWhenSoundDoesNot) {
    BlockRing ring;
    for (std::size_t i = 0; i < BlockRing::kBlockCount; ++i)
        ring.put(1s, std::vector<std::int16_t>{1}, 1000);
    for (std::size_t i = 0; i < BlockRing::kEventRoom + 1; ++i)
        ring.putEvent(BlockRing::Event::interrupted);
    BlockRing::Block block;
    for (std::size_t i = 0; i < BlockRing::kBlockCount - BlockRing::kEventRoom; ++i) {
        ASSERT_TRUE(ring.take(block));
        EXPECT_EQ(block.event, BlockRing::Event::sound);
    }
    for (std::size_t i = 0; i < BlockRing::kEventRoom; ++i) {
        ASSERT_TRUE(ring.take(block));
        EXPECT_EQ(block.event, BlockRing::Event::interrupted);
        EXPECT_EQ(block.count, 0U);
    }
    EXPECT_FALSE(ring.take(block));
}

TEST(TickerTest, TicksUntilItGoes) {
    std::atomic<int> ticks{0};
    std::promise<void> third;
    {
        const Ticker ticker("test.ticker", 1ms, [&] {
            if (++ticks == 3) third.set_value();
        });
        ASSERT_EQ(third.get_future().wait_for(10s), std::future_status::ready);
    }
    EXPECT_GE(ticks, 3);
}

TEST(TickerTest, WokenTickerDoesNotWaitForItsInterval) {
    std::binary_semaphore ticked{0};
    Ticker ticker("test.ticker", 1h, [&] { ticked.release(); });
    for (int i = 0; i < 3; ++i) {
        ticker.wake();
        ASSERT_TRUE(ticked.try_acquire_for(30s));
    }
}

}  // namespace
}  // namespace kelvo::pulse
