#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>

namespace kelvo {

/// Takes big-endian numbers and boxes off the front of bytes. Past the end everything is 0 and `isGood` turns
/// false. Caller's thread.
class BoxReader {
  public:
    explicit BoxReader(std::span<const std::byte> bytes) : bytes_(bytes) {}

    struct Box {
        std::uint32_t type = 0;
        std::span<const std::byte> content;
    };

    bool isGood() const { return isGood_; }
    std::uint32_t u32() { return static_cast<std::uint32_t>(take(4)); }
    std::uint64_t u64() { return take(8); }

    /// The next box; none at the end, and when its size is not that of a box.
    std::optional<Box> box() {
        if (bytes_.size() < kHeaderSize) return std::nullopt;
        const std::uint32_t size = u32();
        const std::uint32_t type = u32();
        if (size < kHeaderSize || size - kHeaderSize > bytes_.size()) return std::nullopt;
        const Box found{type, bytes_.first(size - kHeaderSize)};
        bytes_ = bytes_.subspan(size - kHeaderSize);
        return found;
    }

    static constexpr std::size_t kHeaderSize = 8;

  private:
    std::uint64_t take(std::size_t count) {
        isGood_ = isGood_ && count <= bytes_.size();
        if (!isGood_) return 0;
        std::uint64_t number = 0;
        for (const std::byte byte : bytes_.first(count))
            number = number << 8 | static_cast<std::uint64_t>(byte);
        bytes_ = bytes_.subspan(count);
        return number;
    }

    std::span<const std::byte> bytes_;
    bool isGood_ = true;
};

}  // namespace kelvo
