#pragma once

#include "base/KVError.h"
#include "base/Value.h"

#include <cstddef>
#include <cstdint>
#include <span>

namespace kelvo {

/// Builds the boxes of an MPEG-4 file, big endian: in memory, or straight into a file through a buffer of
/// bounded size. Caller's thread.
///
///     writer.box("mdhd", [&] { writer.u32(0); ... });
class BoxWriter {
  public:
    /// Into memory; `bytes` is the result.
    BoxWriter() = default;
    /// Into the file behind `descriptor`, from `offset` on. Ends with `flush`.
    BoxWriter(int descriptor, std::uint64_t offset) : descriptor_(descriptor), base_(offset) {}

    void u8(std::uint8_t number) { put(number, 1); }
    void u16(std::uint16_t number) { put(number, 2); }
    void u24(std::uint32_t number) { put(number, 3); }
    void u32(std::uint32_t number) { put(number, 4); }
    void u64(std::uint64_t number) { put(number, 8); }
    void type(const char (&code)[5]);
    void bytes(std::span<const std::byte> content);
    void zeros(std::size_t count);

    /// A box whose content `fill` writes; its size is filled in afterwards.
    template <typename Fill>
    void box(const char (&code)[5], Fill&& fill) {
        const std::uint64_t start = position();
        u32(0);
        type(code);
        fill();
        patch32(start, static_cast<std::uint32_t>(position() - start));
    }
    /// The same with a version and flags.
    template <typename Fill>
    void fullBox(const char (&code)[5], std::uint8_t version, std::uint32_t flags, Fill&& fill) {
        box(code, [&] {
            u8(version);
            u24(flags);
            fill();
        });
    }

    /// Where the next byte goes: its offset in the file, or in `bytes`.
    std::uint64_t position() const { return base_ + buffer_.size(); }
    /// Overwrites four bytes that were written before.
    void patch32(std::uint64_t at, std::uint32_t number);

    /// Writes out what is buffered. The first failure of all writing so far.
    OptionalError flush();

    const Bytes& bytes() const { return buffer_; }

  private:
    void put(std::uint64_t number, int byteCount);
    void spillWhenLarge();

    int descriptor_ = -1;
    std::uint64_t base_ = 0;
    Bytes buffer_;
    OptionalError error_;
};

}  // namespace kelvo
