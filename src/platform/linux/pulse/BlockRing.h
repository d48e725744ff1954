#pragma once

#include "base/Guarded.h"

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>

namespace kelvo::pulse {

/// Blocks of sound on their way from the thread that records to the one that delivers. Thread-safe; nothing
/// is allocated after construction. What happened to the stream travels in the same order. When nobody takes
/// the blocks, the newest are dropped.
class BlockRing {
  public:
    static constexpr std::size_t kBlockSize = 2048;
    static constexpr std::size_t kBlockCount = 64;
    /// Room that sound leaves for events.
    static constexpr std::size_t kEventRoom = 8;

    enum class Event { sound, interrupted, resumed };

    /// Up to `kBlockSize` samples that began to sound at `moment`; or another event, without samples.
    struct Block {
        Event event = Event::sound;
        std::chrono::nanoseconds moment{};
        std::size_t count = 0;
        std::array<std::int16_t, kBlockSize> samples;

        std::span<const std::int16_t> content() const { return {samples.data(), count}; }
    };

    /// Cuts `samples` into blocks; `rate` frames a second of one sample each.
    void put(std::chrono::nanoseconds moment, std::span<const std::int16_t> samples, std::uint32_t rate);

    void putEvent(Event event);

    /// Copies the oldest block; false when there is none.
    bool take(Block& block);

  private:
    struct Blocks {
        std::unique_ptr<std::array<Block, kBlockCount>> ring =
            std::make_unique<std::array<Block, kBlockCount>>();
        std::size_t first = 0;
        std::size_t count = 0;
    };
    static Block& append(Blocks& blocks, Event event);

    Guarded<Blocks> blocks_;
};

}  // namespace kelvo::pulse
