#include "platform/linux/media/PcmReader.h"

#include "platform/MediaErrors.h"

#include <algorithm>
#include <bit>
#include <cmath>

namespace kelvo {
namespace {

/// Where the samples of a buffer lie and how one is read.
struct Layout {
    std::size_t channelCount = 0;
    std::size_t containerSize = 0;  ///< bytes that hold one channel's sample
    unsigned bits = 0;
    unsigned unusedLowBits = 0;  ///< of the container
    bool isFloat = false;
    bool isSigned = false;
    bool isBigEndian = false;
    bool isInterleaved = true;
};

std::optional<Layout> layoutOf(const AudioFormatRecord& format) {
    const auto has = [&](AudioFormatFlag flag) { return (format.formatFlags & flag) != 0; };
    if (format.formatIdentifier != kLinearPCMFormat) return std::nullopt;
    if (!(format.sampleRate >= 8000 && format.sampleRate <= 192000)) return std::nullopt;
    if (format.channelsPerFrame < 1 || format.channelsPerFrame > 8) return std::nullopt;
    Layout layout;
    layout.channelCount = format.channelsPerFrame;
    layout.bits = format.bitsPerChannel;
    layout.isFloat = has(kAudioFlagFloat);
    layout.isSigned = has(kAudioFlagSignedInteger);
    layout.isBigEndian = has(kAudioFlagBigEndian);
    layout.isInterleaved = !has(kAudioFlagNonInterleaved);
    const std::size_t samplesPerFrame = layout.isInterleaved ? layout.channelCount : 1;
    if (format.bytesPerFrame % samplesPerFrame != 0) return std::nullopt;
    layout.containerSize = format.bytesPerFrame / samplesPerFrame;
    if (layout.isFloat ? layout.bits != 32 && layout.bits != 64 : layout.bits < 8 || layout.bits > 32) {
        return std::nullopt;
    }
    if (layout.containerSize > 8 || layout.containerSize * 8 < layout.bits) return std::nullopt;
    const auto unused = static_cast<unsigned>(layout.containerSize * 8) - layout.bits;
    if (has(kAudioFlagAlignedHigh)) layout.unusedLowBits = unused;
    return layout;
}

std::uint64_t readContainer(const std::byte* bytes, const Layout& layout) {
    std::uint64_t number = 0;
    for (std::size_t i = 0; i < layout.containerSize; ++i) {
        const std::size_t at = layout.isBigEndian ? i : layout.containerSize - 1 - i;
        number = number << 8 | std::to_integer<std::uint64_t>(bytes[at]);
    }
    return number >> layout.unusedLowBits;
}

/// Players and encoders choke on what is no number.
float finite(float number) {
    return std::isfinite(number) ? number : 0.0F;
}

float readSample(const std::byte* bytes, const Layout& layout) {
    const std::uint64_t raw = readContainer(bytes, layout);
    if (layout.isFloat && layout.bits == 32)
        return finite(std::bit_cast<float>(static_cast<std::uint32_t>(raw)));
    if (layout.isFloat) return finite(static_cast<float>(std::bit_cast<double>(raw)));
    const std::uint64_t middle = std::uint64_t{1} << (layout.bits - 1);
    const std::uint64_t value = raw & (2 * middle - 1);
    // Adding half the range with wrap-around turns two's complement into an offset, as unsigned samples have.
    const std::uint64_t offset = layout.isSigned ? value ^ middle : value;
    return static_cast<float>((static_cast<double>(offset) - static_cast<double>(middle)) /
                              static_cast<double>(middle));
}

}  // namespace

void PcmBlock::dropFirst(std::size_t count) {
    for (auto& channel : channels) {
        const auto end = channel.begin() + static_cast<std::ptrdiff_t>(std::min(count, channel.size()));
        channel.erase(channel.begin(), end);
    }
}

PcmBlock PcmBlock::part(std::size_t first, std::size_t count) const {
    PcmBlock part{sampleRate, {}};
    for (const auto& channel : channels) {
        const auto begin = channel.begin() + static_cast<std::ptrdiff_t>(first);
        part.channels.emplace_back(begin, begin + static_cast<std::ptrdiff_t>(count));
    }
    return part;
}

Result<PcmBlock> readPcm(const SampleBuffer& sample) {
    const auto layout = layoutOf(sample.audioFormat());
    if (!layout) return mediaError(kMediaErrorUnsupportedFormat, "not a linear PCM format");
    const std::span<const std::byte> bytes = sample.audioBytes();
    const std::size_t held = bytes.size() / (layout->containerSize * layout->channelCount);
    const auto claimed = static_cast<std::size_t>(std::max<std::int64_t>(sample.sampleCount(), 0));
    const std::size_t count = std::min(held, claimed);
    const std::size_t sampleStride =
        layout->containerSize * (layout->isInterleaved ? layout->channelCount : 1);
    const std::size_t channelStride = layout->containerSize * (layout->isInterleaved ? 1 : count);
    PcmBlock block{sample.audioFormat().sampleRate, {}};
    for (std::size_t channel = 0; channel < layout->channelCount; ++channel) {
        auto& samples = block.channels.emplace_back(count);
        for (std::size_t i = 0; i < count; ++i)
            samples[i] = readSample(&bytes[channel * channelStride + i * sampleStride], *layout);
    }
    return block;
}

}  // namespace kelvo
