#include "platform/linux/media/AacBitstream.h"

#include "platform/MediaErrors.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cstdint>
#include <optional>
#include <vector>

namespace kelvo {
namespace {

constexpr int kElementBits = 3;
constexpr std::uint32_t kSingleChannelElement = 0;
constexpr std::uint32_t kChannelPairElement = 1;
constexpr std::uint32_t kEndElement = 7;
constexpr int kInstanceTagBits = 4;
constexpr int kGlobalGainBits = 8;
constexpr int kCodebookBits = 4;

constexpr std::uint32_t kNoCodebook = 0;  ///< a band without content
constexpr std::uint32_t kNoiseCodebook = 13;
constexpr std::uint32_t kIntensityCodebook = 15;  ///< a band as the other channel's, in phase

/// Reads bits from the front; beyond the end it reads zeros and remembers that it did.
class BitReader {
  public:
    explicit BitReader(std::span<const std::byte> bytes, std::size_t position = 0)
        : bytes_(bytes), position_(position) {}

    /// At most 32 bits.
    std::uint32_t read(int count) {
        constexpr std::size_t kWindowBytes = 5;
        std::uint64_t window = 0;
        for (std::size_t i = 0; i < kWindowBytes; ++i)
            window = window << 8 | byteAt(position_ / 8 + i);
        const auto behind = static_cast<int>(8 * kWindowBytes - position_ % 8) - count;
        skip(count);
        return static_cast<std::uint32_t>(window >> behind & ((std::uint64_t{1} << count) - 1));
    }
    bool flag() { return read(1) != 0; }
    void skip(int count) { position_ += static_cast<std::size_t>(count); }
    std::size_t position() const { return position_; }
    bool isWithin() const { return position_ <= 8 * bytes_.size(); }

  private:
    std::uint64_t byteAt(std::size_t index) const {
        return index < bytes_.size() ? std::to_integer<std::uint64_t>(bytes_[index]) : 0;
    }

    std::span<const std::byte> bytes_;
    std::size_t position_;
};

class BitWriter {
  public:
    explicit BitWriter(std::size_t byteCount) { bytes_.reserve(byteCount); }

    /// At most 32 bits.
    void write(std::uint32_t value, int count) {
        pending_ = pending_ << count | value;
        for (pendingCount_ += count; pendingCount_ >= 8; pendingCount_ -= 8)
            bytes_.push_back(static_cast<std::byte>(pending_ >> (pendingCount_ - 8)));
    }
    void copy(std::span<const std::byte> source, std::size_t begin, std::size_t end) {
        constexpr std::size_t kMost = 32;
        for (BitReader bits(source, begin); bits.position() < end;) {
            const auto count = static_cast<int>(std::min(kMost, end - bits.position()));
            write(bits.read(count), count);
        }
    }
    /// With zeros up to a whole byte.
    Bytes take() {
        if (pendingCount_ > 0) write(0, 8 - pendingCount_);
        return std::move(bytes_);
    }

  private:
    Bytes bytes_;
    std::uint64_t pending_ = 0;
    int pendingCount_ = 0;
};

/// What all of a frame's bands have in common (ics_info).
struct Layout {
    bool isShort = false;  ///< eight short windows instead of a long one
    int bandCount = 0;     ///< of each group
    int groupCount = 1;    ///< of windows that share their scale factors

    int windowCount() const { return isShort ? 8 : 1; }
    int sectionLengthBits() const { return isShort ? 3 : 5; }
};

Layout readLayout(BitReader& bits) {
    constexpr std::uint32_t kEightShort = 2;
    Layout layout;
    bits.skip(1);  // reserved
    layout.isShort = bits.read(2) == kEightShort;
    bits.skip(1);  // the window's shape
    layout.bandCount = static_cast<int>(bits.read(layout.isShort ? 4 : 6));
    if (layout.isShort) {
        layout.groupCount = 8 - std::popcount(bits.read(7));  // a set bit: a window of the same group
    } else {
        bits.skip(1);  // no prediction in this profile
    }
    return layout;
}

/// The codebooks of all bands, group by group (section_data).
std::vector<std::uint32_t> readCodebooks(BitReader& bits, const Layout& layout) {
    const std::uint32_t escape = (1U << layout.sectionLengthBits()) - 1;
    std::vector<std::uint32_t> codebooks;
    for (int group = 0; group < layout.groupCount; ++group) {
        for (int band = 0; band < layout.bandCount && bits.isWithin();) {
            const std::uint32_t codebook = bits.read(kCodebookBits);
            std::uint32_t part = escape;
            int length = 0;
            while (part == escape && bits.isWithin()) {
                part = bits.read(layout.sectionLengthBits());
                length += static_cast<int>(part);
            }
            length = std::min(length, layout.bandCount - band);
            codebooks.insert(codebooks.end(), static_cast<std::size_t>(length), codebook);
            band += std::max(length, 1);
        }
    }
    return codebooks;
}

/// Skips a difference of scale factors. Their code is canonical: the codes of a length follow each other.
void skipDifference(BitReader& bits) {
    constexpr std::array<std::uint32_t, 20> kCodesOfLength{0, 1, 0, 1, 3, 2, 4, 3, 5, 4,
                                                           6, 6, 6, 5, 8, 4, 7, 3, 7, 46};
    std::uint32_t code = 0;
    std::uint32_t first = 0;
    for (std::size_t length = 1; length < kCodesOfLength.size(); ++length) {
        code = code << 1 | bits.read(1);
        first = (first + kCodesOfLength[length - 1]) << 1;
        if (code < first + kCodesOfLength[length]) return;
    }
}

void skipScaleFactors(BitReader& bits, const std::vector<std::uint32_t>& codebooks) {
    constexpr int kFirstNoiseBits = 9;
    bool isNoiseNew = true;
    for (const std::uint32_t codebook : codebooks) {
        if (codebook == kNoCodebook) continue;
        if (codebook == kNoiseCodebook && isNoiseNew) {
            bits.skip(kFirstNoiseBits);
            isNoiseNew = false;
        } else {
            skipDifference(bits);
        }
    }
}

void skipPulses(BitReader& bits) {
    if (!bits.flag()) return;
    const auto count = static_cast<int>(bits.read(2)) + 1;
    bits.skip(6 + count * (5 + 4));
}

/// Skips the filters that shape noise in time (tns_data).
void skipNoiseShaping(BitReader& bits, const Layout& layout) {
    if (!bits.flag()) return;
    for (int window = 0; window < layout.windowCount(); ++window) {
        const std::uint32_t filterCount = bits.read(layout.isShort ? 1 : 2);
        const int resolution = filterCount > 0 ? static_cast<int>(bits.read(1)) : 0;
        for (std::uint32_t filter = 0; filter < filterCount; ++filter) {
            bits.skip(layout.isShort ? 4 : 6);
            const auto order = static_cast<int>(bits.read(layout.isShort ? 3 : 5));
            if (order == 0) continue;
            bits.skip(1);  // its direction
            const auto compression = static_cast<int>(bits.read(1));
            bits.skip(order * (3 + resolution - compression));
        }
    }
}

/// Where the parts of a single channel's frame begin, in bits.
struct Parts {
    Layout layout;
    std::size_t layoutBegin = 0;
    std::size_t sectionsBegin = 0;
    std::size_t noiseShapingBegin = 0;
    std::size_t noiseShapingEnd = 0;
    std::size_t end = 0;  ///< of the channel
};

/// The last bit that is set ends the element which ends the frame; zeros up to a whole byte follow it.
std::size_t endOfContent(std::span<const std::byte> frame) {
    if (frame.empty() || frame.back() == std::byte{0}) return 0;
    const auto padding = std::countr_zero(std::to_integer<unsigned>(frame.back()));
    return 8 * frame.size() - static_cast<std::size_t>(padding + kElementBits);
}

std::optional<Parts> partsOf(std::span<const std::byte> frame) {
    BitReader bits(frame);
    Parts parts;
    if (bits.read(kElementBits) != kSingleChannelElement) return std::nullopt;
    bits.skip(kInstanceTagBits + kGlobalGainBits);
    parts.layoutBegin = bits.position();
    parts.layout = readLayout(bits);
    parts.sectionsBegin = bits.position();
    skipScaleFactors(bits, readCodebooks(bits, parts.layout));
    skipPulses(bits);
    parts.noiseShapingBegin = bits.position();
    skipNoiseShaping(bits, parts.layout);
    parts.noiseShapingEnd = bits.position();
    parts.end = endOfContent(frame);
    const bool isWhole =
        parts.noiseShapingEnd < parts.end && BitReader(frame, parts.end).read(kElementBits) == kEndElement;
    return isWhole ? std::optional(parts) : std::nullopt;
}

/// The right channel: all its bands are the left one's, as loud and in phase. Filters are each channel's own.
void writeSecondChannel(BitWriter& output, std::span<const std::byte> frame, const Parts& parts) {
    const int lengthBits = parts.layout.sectionLengthBits();
    const int escape = (1 << lengthBits) - 1;
    output.write(0, kGlobalGainBits);
    for (int group = 0; group < parts.layout.groupCount && parts.layout.bandCount > 0; ++group) {
        output.write(kIntensityCodebook, kCodebookBits);
        int length = parts.layout.bandCount;
        for (; length >= escape; length -= escape)
            output.write(static_cast<std::uint32_t>(escape), lengthBits);
        output.write(static_cast<std::uint32_t>(length), lengthBits);
    }
    for (int band = 0; band < parts.layout.groupCount * parts.layout.bandCount; ++band)
        output.write(0, 1);  // no difference of loudness
    output.write(0, 1);      // no pulses
    output.copy(frame, parts.noiseShapingBegin, parts.noiseShapingEnd);
    output.write(0, 1);  // no gain control
}

}  // namespace

Result<Bytes> aacStereoFrame(std::span<const std::byte> monoFrame) {
    const std::optional<Parts> parts = partsOf(monoFrame);
    if (!parts) return mediaError(kMediaErrorEncodingFailed, "the AAC encoder made no frame of one channel");
    constexpr std::size_t kTagBegin = kElementBits;
    constexpr std::size_t kGainBegin = kTagBegin + kInstanceTagBits;
    BitWriter output(monoFrame.size() + kAacSecondChannelBits / 8 + 1);
    output.write(kChannelPairElement, kElementBits);
    output.copy(monoFrame, kTagBegin, kGainBegin);
    output.write(1, 1);  // both channels have the layout in common
    output.copy(monoFrame, parts->layoutBegin, parts->sectionsBegin);
    output.write(0, 2);  // no sums and differences
    output.copy(monoFrame, kGainBegin, parts->layoutBegin);
    output.copy(monoFrame, parts->sectionsBegin, parts->end);
    writeSecondChannel(output, monoFrame, *parts);
    output.write(kEndElement, kElementBits);
    return output.take();
}

Bytes aacStereoConfiguration(std::span<const std::byte> monoConfiguration) {
    // Five bits say the kind of object, four the rate, then four the channels.
    constexpr std::byte kChannels{0b0111'1000};
    constexpr std::byte kTwo{2 << 3};
    Bytes configuration(monoConfiguration.begin(), monoConfiguration.end());
    if (configuration.size() > 1) configuration[1] = (configuration[1] & ~kChannels) | kTwo;
    return configuration;
}

}  // namespace kelvo
