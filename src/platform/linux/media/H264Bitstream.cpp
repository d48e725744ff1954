#include "platform/linux/media/H264Bitstream.h"

#include <algorithm>
#include <array>
#include <cstring>

namespace kelvo {
namespace {

using Unit = std::span<const std::byte>;

/// The position of the next 00 00 01 from `from` on, or the end.
std::size_t findStartCode(Unit bytes, std::size_t from) {
    // Looks for the rare byte, the 01, rather than for the zeros.
    for (std::size_t at = from + 2; at < bytes.size();) {
        const void* found = std::memchr(bytes.data() + at, 1, bytes.size() - at);
        if (found == nullptr) break;
        at = static_cast<std::size_t>(static_cast<const std::byte*>(found) - bytes.data());
        if (at >= from + 2 && bytes[at - 1] == std::byte{0} && bytes[at - 2] == std::byte{0}) return at - 2;
        ++at;
    }
    return bytes.size();
}

/// Calls `visit` for each unit, without its start code and the zeros behind it.
template <typename Visit>
void forEachUnit(Unit bytes, Visit&& visit) {
    constexpr std::size_t kStartCodeSize = 3;
    std::size_t start = findStartCode(bytes, 0);
    while (start < bytes.size()) {
        const std::size_t begin = start + kStartCodeSize;
        start = findStartCode(bytes, begin);
        std::size_t end = start;
        while (end > begin && bytes[end - 1] == std::byte{0})
            --end;
        if (end > begin) visit(bytes.subspan(begin, end - begin));
    }
}

int typeOf(Unit unit) {
    return std::to_integer<int>(unit.front()) & 0x1F;
}

void appendNumber(Bytes& output, std::size_t number, int byteCount) {
    for (int shift = 8 * (byteCount - 1); shift >= 0; shift -= 8)
        output.push_back(static_cast<std::byte>(number >> shift));
}

}  // namespace

Bytes avcConfiguration(std::span<const std::byte> units) {
    constexpr int kSequenceParameters = 7;
    constexpr int kPictureParameters = 8;
    Unit sequence;
    Unit picture;
    forEachUnit(units, [&](Unit unit) {
        if (typeOf(unit) == kSequenceParameters && sequence.empty()) sequence = unit;
        if (typeOf(unit) == kPictureParameters && picture.empty()) picture = unit;
    });
    if (sequence.size() < 4 || picture.empty()) return {};
    Bytes record{std::byte{1}};
    record.insert(record.end(), sequence.begin() + 1, sequence.begin() + 4);  // profile and level
    appendNumber(record, 0xFF, 1);                                            // sizes have four bytes
    appendNumber(record, 0xE1, 1);                                            // one sequence parameter set
    appendNumber(record, sequence.size(), 2);
    record.insert(record.end(), sequence.begin(), sequence.end());
    appendNumber(record, 1, 1);
    appendNumber(record, picture.size(), 2);
    record.insert(record.end(), picture.begin(), picture.end());
    if (const int profile = std::to_integer<int>(sequence[1]); profile >= 100 && profile != 0xFF) {
        appendNumber(record, 0xFDF8F800, 4);  // 4:2:0, eight bits twice, no extensions
    }
    return record;
}

void appendWithSizes(std::span<const std::byte> units, Bytes& output) {
    output.reserve(output.size() + units.size() + 16);
    forEachUnit(units, [&](Unit unit) {
        appendNumber(output, unit.size(), 4);
        output.insert(output.end(), unit.begin(), unit.end());
    });
}

}  // namespace kelvo
