#include "platform/linux/media/BoxReader.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>

namespace {

/// How much of `bytes` lies in boxes, whatever they hold.
std::size_t sizeOfBoxes(std::span<const std::byte> bytes, int depth) {
    kelvo::BoxReader reader(bytes);
    std::size_t total = 0;
    while (const auto box = reader.box()) {
        total += kelvo::BoxReader::kHeaderSize + box->content.size();
        const std::size_t inner = depth < 16 ? sizeOfBoxes(box->content, depth + 1) : 0;
        if (inner > box->content.size()) std::abort();
    }
    return total;
}

}  // namespace

/// Boxes never reach beyond what they stand in, and past the end every number is 0.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const auto bytes = std::as_bytes(std::span(data, size));
    if (sizeOfBoxes(bytes, 0) > size) std::abort();
    kelvo::BoxReader reader(bytes);
    for (std::size_t i = 0; i < size / 8; ++i)
        reader.u64();
    const bool isAtEnd = size % 8 < 4;
    if (isAtEnd && (reader.u32() != 0 || reader.isGood())) std::abort();
    return 0;
}
