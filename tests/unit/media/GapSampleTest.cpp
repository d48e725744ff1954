#include "media/GapSample.h"

#include <limits>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

constexpr MediaTime kStart = MediaTime::make(7, 1000000000);

TEST(GapSampleTest, FramesAreCountedAt44100HzWhateverTheFormatsRate) {
    const auto sample = makeGapSample(AudioFormatRecord::signed16(48000, 2), 0.5, kStart);
    ASSERT_TRUE(sample);
    EXPECT_EQ(sample->sampleCount(), 22050);
    EXPECT_EQ(sample->audioBytes().size(), 22050U * 4);
    EXPECT_EQ(sample->duration(), MediaTime::make(22050, 44100));
    EXPECT_EQ(sample->presentationTime(), kStart);
    EXPECT_FALSE(sample->decodeTime().isValid());
}

TEST(GapSampleTest, FormatWithoutBytesInAFrameHasOneByteASample) {
    AudioFormatRecord format = AudioFormatRecord::signed16(44100, 1);
    format.bytesPerFrame = 0;
    format.bytesPerPacket = 99;
    const auto sample = makeGapSample(format, 1, kStart);
    ASSERT_TRUE(sample);
    EXPECT_EQ(sample->sampleCount(), 44100);
    EXPECT_EQ(sample->audioBytes().size(), 44100U);
}

TEST(GapSampleTest, PacketsOfSeveralFramesAreCountedDown) {
    AudioFormatRecord format = AudioFormatRecord::signed16(44100, 1);
    format.framesPerPacket = 1024;
    format.bytesPerPacket = 2048;
    const auto sample = makeGapSample(format, 1, kStart);
    ASSERT_TRUE(sample);
    EXPECT_EQ(sample->sampleCount(), 43) << "44100 / 1024, truncated";
    EXPECT_EQ(sample->audioBytes().size(), 43U * 2048);
    EXPECT_EQ(sample->duration(), MediaTime::make(44100, 44100));
}

TEST(GapSampleTest, GapsThatMakeNoSenseAreNotFilled) {
    const AudioFormatRecord format = AudioFormatRecord::signed16(44100, 1);
    EXPECT_FALSE(makeGapSample(format, 0, kStart));
    EXPECT_FALSE(makeGapSample(format, -1, kStart));
    EXPECT_FALSE(makeGapSample(format, std::numeric_limits<double>::quiet_NaN(), kStart));
    EXPECT_FALSE(makeGapSample(format, kLongestGapSeconds + 1, kStart));
    AudioFormatRecord none = format;
    none.framesPerPacket = 0;
    EXPECT_FALSE(makeGapSample(none, 1, kStart));
}

}  // namespace
}  // namespace kelvo
