#include "platform/linux/media/BoxReader.h"
#include "platform/linux/media/H264Bitstream.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>

/// Any bytes become units whose sizes add up, or nothing.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kelvo;
    const auto bytes = std::as_bytes(std::span(data, size));
    const Bytes record = avcConfiguration(bytes);
    if (record.size() > 2 * size + 16 || (!record.empty() && record.size() < 12)) std::abort();
    Bytes sized{std::byte{0xAA}};
    appendWithSizes(bytes, sized);
    std::span<const std::byte> left(sized);
    left = left.subspan(1);
    while (!left.empty()) {
        BoxReader reader(left);
        const std::size_t unit = reader.u32();
        if (!reader.isGood() || unit == 0 || unit > left.size() - 4) std::abort();
        left = left.subspan(4 + unit);
    }
    return 0;
}
