#include "base/MediaRecords.h"

#include <bit>
#include <cstring>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

std::vector<std::byte> bytesFrom(std::initializer_list<int> values) {
    std::vector<std::byte> bytes;
    for (const int value : values)
        bytes.push_back(static_cast<std::byte>(value));
    return bytes;
}

template <typename Record>
std::vector<std::byte> wire(const Record& record) {
    const auto bytes = bytesOfRecord(record);
    return {bytes.begin(), bytes.end()};
}

// A time of which every byte differs.
constexpr MediaTime kTelling{0x0102030405060708, 0x11121314, 0x21222324, 0x3132333435363738};

const TimingRecord kTiming{{1, 600, 1, 0}, {-2, 1000000000, 1, 0}, MediaTime::invalid()};

TEST(MediaRecordsTest, MediaTimeIsValueTimescaleFlagsAndEpochInLittleEndian) {
    EXPECT_EQ(wire(kTelling), bytesFrom({
                                  0x08, 0x07, 0x06, 0x05, 0x04, 0x03, 0x02, 0x01,  // value
                                  0x14, 0x13, 0x12, 0x11,                          // timescale
                                  0x24, 0x23, 0x22, 0x21,                          // flags
                                  0x38, 0x37, 0x36, 0x35, 0x34, 0x33, 0x32, 0x31,  // epoch
                              }));
}

TEST(MediaRecordsTest, NegativeMediaTimeIsTwosComplement) {
    EXPECT_EQ(wire(MediaTime::make(-1, 600)), bytesFrom({
                                                  0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF,  //
                                                  0x58, 0x02, 0x00, 0x00,                          //
                                                  0x01, 0x00, 0x00, 0x00,                          //
                                                  0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00,  //
                                              }));
}

TEST(MediaRecordsTest, MediaTimeThatIsNotSetIs24ZeroBytes) {
    EXPECT_EQ(wire(MediaTime::invalid()), std::vector<std::byte>(24));
}

TEST(MediaRecordsTest, TimingRecordIsDurationPresentationAndDecodeTime) {
    EXPECT_EQ(wire(kTiming), bytesFrom({
                                 0x01, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00,  // duration: value
                                 0x58, 0x02, 0x00, 0x00, 0x01, 0x00, 0x00, 0x00,  // timescale, flags
                                 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00,  // epoch
                                 0xFE, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF,  // presentation time
                                 0x00, 0xCA, 0x9A, 0x3B, 0x01, 0x00, 0x00, 0x00,  //
                                 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00,  //
                                 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00,  // decode time
                                 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00,  //
                                 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00, 0x00,  //
                             }));
}

TEST(MediaRecordsTest, AudioFormatRecordIsTheRateAndEightNumbers) {
    const AudioFormatRecord format{48000, 0x6C70636D, 0x09, 4, 1, 8, 2, 32, 0x01020304};
    EXPECT_EQ(wire(format), bytesFrom({
                                0x00, 0x00, 0x00, 0x00, 0x00, 0x70, 0xE7, 0x40,  // sample rate
                                0x6D, 0x63, 0x70, 0x6C,                          // format identifier
                                0x09, 0x00, 0x00, 0x00,                          // format flags
                                0x04, 0x00, 0x00, 0x00,                          // bytes per packet
                                0x01, 0x00, 0x00, 0x00,                          // frames per packet
                                0x08, 0x00, 0x00, 0x00,                          // bytes per frame
                                0x02, 0x00, 0x00, 0x00,                          // channels per frame
                                0x20, 0x00, 0x00, 0x00,                          // bits per channel
                                0x04, 0x03, 0x02, 0x01,                          // reserved
                            }));
}

TEST(MediaRecordsTest, RecordsComeBackFromTheirBytes) {
    EXPECT_EQ(recordFromBytes<MediaTime>(bytesOfRecord(kTelling)), kTelling);
    EXPECT_EQ(recordFromBytes<TimingRecord>(bytesOfRecord(kTiming)), kTiming);
    const AudioFormatRecord format = AudioFormatRecord::signed16(44100, 1);
    EXPECT_EQ(recordFromBytes<AudioFormatRecord>(bytesOfRecord(format)), format);
}

TEST(MediaRecordsTest, FourCharacterCodeHasItsFirstCharacterInTheHighestByte) {
    EXPECT_EQ(kLinearPCMFormat, 0x6C70636DU);
    EXPECT_EQ(kAACFormat, 0x61616320U);
}

TEST(MediaRecordsTest, Signed16IsPackedIntegers) {
    const AudioFormatRecord format = AudioFormatRecord::signed16(44100, 2);
    EXPECT_EQ(format, (AudioFormatRecord{44100, kLinearPCMFormat, 0x0C, 4, 1, 4, 2, 16, 0}));
}

TEST(MediaRecordsTest, Float32IsPackedFloats) {
    const AudioFormatRecord format = AudioFormatRecord::float32(48000, 1);
    EXPECT_EQ(format, (AudioFormatRecord{48000, kLinearPCMFormat, 0x09, 4, 1, 4, 1, 32, 0}));
}

}  // namespace
}  // namespace kelvo
