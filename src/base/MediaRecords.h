#pragma once

#include "base/MediaTime.h"

#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>

namespace kelvo {

/// The timing of one sample, sent beside it as 72 raw bytes.
struct TimingRecord {
    MediaTime duration;
    MediaTime presentationTime;
    MediaTime decodeTime;

    friend bool operator==(const TimingRecord&, const TimingRecord&) = default;
};

static_assert(sizeof(TimingRecord) == 72);
static_assert(offsetof(TimingRecord, duration) == 0);
static_assert(offsetof(TimingRecord, presentationTime) == 24);
static_assert(offsetof(TimingRecord, decodeTime) == 48);

/// A four-character code as the number that stands for it: the first character in the highest byte.
constexpr std::uint32_t fourCharacterCode(const char (&code)[5]) {
    std::uint32_t number = 0;
    for (int i = 0; i < 4; ++i)
        number = number << 8 | static_cast<unsigned char>(code[i]);
    return number;
}

/// Format identifier of uncompressed samples.
inline constexpr std::uint32_t kLinearPCMFormat = fourCharacterCode("lpcm");
/// Format identifier of AAC.
inline constexpr std::uint32_t kAACFormat = fourCharacterCode("aac ");

/// Bits of `AudioFormatRecord::formatFlags` for linear PCM.
enum AudioFormatFlag : std::uint32_t {
    kAudioFlagFloat = 1U << 0,          ///< IEEE floating point; otherwise integers
    kAudioFlagBigEndian = 1U << 1,      ///< otherwise little endian
    kAudioFlagSignedInteger = 1U << 2,  ///< otherwise unsigned, when not float
    kAudioFlagPacked = 1U << 3,         ///< the sample bits fill their container
    kAudioFlagAlignedHigh = 1U << 4,    ///< when not packed: the sample bits sit in the container's high bits
    kAudioFlagNonInterleaved = 1U << 5,  ///< one channel's samples after the other's within a buffer
};

/// The linear description of an audio stream's format, sent as 40 raw bytes. Sizes are in bytes, the rate in
/// hertz.
struct AudioFormatRecord {
    double sampleRate = 0;
    std::uint32_t formatIdentifier = 0;
    std::uint32_t formatFlags = 0;
    std::uint32_t bytesPerPacket = 0;
    std::uint32_t framesPerPacket = 0;
    std::uint32_t bytesPerFrame = 0;
    std::uint32_t channelsPerFrame = 0;
    std::uint32_t bitsPerChannel = 0;
    std::uint32_t reserved = 0;

    /// Packed, interleaved, little-endian signed integers of 16 bits.
    static AudioFormatRecord signed16(double sampleRate, std::uint32_t channels);
    /// Packed, interleaved, little-endian 32-bit floats.
    static AudioFormatRecord float32(double sampleRate, std::uint32_t channels);

    friend bool operator==(const AudioFormatRecord&, const AudioFormatRecord&) = default;
};

static_assert(sizeof(AudioFormatRecord) == 40);
static_assert(offsetof(AudioFormatRecord, sampleRate) == 0);
static_assert(offsetof(AudioFormatRecord, formatIdentifier) == 8);
static_assert(offsetof(AudioFormatRecord, formatFlags) == 12);
static_assert(offsetof(AudioFormatRecord, bytesPerPacket) == 16);
static_assert(offsetof(AudioFormatRecord, framesPerPacket) == 20);
static_assert(offsetof(AudioFormatRecord, bytesPerFrame) == 24);
static_assert(offsetof(AudioFormatRecord, channelsPerFrame) == 28);
static_assert(offsetof(AudioFormatRecord, bitsPerChannel) == 32);
static_assert(offsetof(AudioFormatRecord, reserved) == 36);

// The records cross processes of one machine as they lie in memory; little endian is what the byte tests
// hold.
static_assert(std::endian::native == std::endian::little);

template <typename Record>
using RecordBytes = std::array<std::byte, sizeof(Record)>;

/// The bytes that are sent for a record, and the record that such bytes stand for.
template <typename Record>
RecordBytes<Record> bytesOfRecord(const Record& record) {
    return std::bit_cast<RecordBytes<Record>>(record);
}
template <typename Record>
Record recordFromBytes(const RecordBytes<Record>& bytes) {
    return std::bit_cast<Record>(bytes);
}

}  // namespace kelvo
