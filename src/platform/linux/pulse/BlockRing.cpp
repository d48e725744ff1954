#include "platform/linux/pulse/BlockRing.h"

#include "platform/linux/pulse/StreamClock.h"

#include <algorithm>

namespace kelvo::pulse {

BlockRing::Block& BlockRing::append(Blocks& blocks, Event event) {
    Block& block = (*blocks.ring)[(blocks.first + blocks.count++) % kBlockCount];
    block.event = event;
    block.count = 0;
    return block;
}

void BlockRing::putEvent(Event event) {
    blocks_.with([&](Blocks& blocks) {
        if (blocks.count < kBlockCount) append(blocks, event);
    });
}

void BlockRing::put(std::chrono::nanoseconds moment, std::span<const std::int16_t> samples,
                    std::uint32_t rate) {
    blocks_.with([&](Blocks& blocks) {
        while (!samples.empty() && blocks.count < kBlockCount - kEventRoom) {
            Block& block = append(blocks, Event::sound);
            block.moment = moment;
            block.count = std::min(samples.size(), kBlockSize);
            std::ranges::copy(samples.first(block.count), block.samples.begin());
            samples = samples.subspan(block.count);
            moment += durationOf(static_cast<std::int64_t>(block.count), rate);
        }
    });
}

bool BlockRing::take(Block& block) {
    return blocks_.with([&](Blocks& blocks) {
        if (blocks.count == 0) return false;
        const Block& oldest = (*blocks.ring)[blocks.first];
        block.event = oldest.event;
        block.moment = oldest.moment;
        block.count = oldest.count;
        std::ranges::copy(oldest.content(), block.samples.begin());
        blocks.first = (blocks.first + 1) % kBlockCount;
        --blocks.count;
        return true;
    });
}

}  // namespace kelvo::pulse
