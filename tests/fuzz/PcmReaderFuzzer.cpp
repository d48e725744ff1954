#include "platform/linux/media/PcmReader.h"

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <span>

/// Any format record with any bytes is sound, of finite numbers and no more than the bytes hold, or an error.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kelvo;
    AudioFormatRecord format;
    std::int64_t count = 0;
    if (size < sizeof(format) + sizeof(count)) return 0;
    std::memcpy(&format, data, sizeof(format));
    std::memcpy(&count, data + sizeof(format), sizeof(count));
    const auto bytes = std::as_bytes(std::span(data, size)).subspan(sizeof(format) + sizeof(count));
    const auto sample = SampleBuffer::audio(format, Bytes(bytes.begin(), bytes.end()), count, {});
    const auto block = readPcm(*sample);
    if (!block) return 0;
    if (block->sampleCount() * block->channels.size() > bytes.size()) std::abort();
    for (const auto& channel : block->channels) {
        if (channel.size() != block->sampleCount()) std::abort();
        for (const float number : channel) {
            if (!std::isfinite(number)) std::abort();
        }
    }
    return 0;
}
