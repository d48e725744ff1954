#include "base/SampleBuffer.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

const TimingRecord kTiming{MediaTime::make(1, 60), MediaTime::make(2, 60), MediaTime::make(3, 60)};
const TimingRecord kOtherTiming{MediaTime::make(7, 60), MediaTime::make(8, 60), MediaTime::make(9, 60)};

Bytes someBytes() {
    return {std::byte{1}, std::byte{2}, std::byte{3}, std::byte{4}};
}

SampleBufferRef someAudio() {
    return SampleBuffer::audio(AudioFormatRecord::signed16(48000, 1), someBytes(), 2, kTiming);
}

std::vector<std::byte> bytesOf(const SampleBufferRef& sample) {
    return {sample->audioBytes().begin(), sample->audioBytes().end()};
}

TEST(SampleBufferTest, TypesHaveTheNumbersThatClientsSee) {
    EXPECT_EQ(static_cast<int>(SampleBuffer::Type::video), 1);
    EXPECT_EQ(static_cast<int>(SampleBuffer::Type::applicationAudio), 2);
    EXPECT_EQ(static_cast<int>(SampleBuffer::Type::microphone), 3);
}

TEST(SampleBufferTest, VideoSampleHasASurfaceAndNoSound) {
    const auto surface = *VideoSurface::create(VideoSurface::Geometry::packed(2, 2));
    const auto sample = SampleBuffer::video(surface, kTiming);
    EXPECT_TRUE(sample->isVideo());
    EXPECT_EQ(sample->surface(), surface);
    EXPECT_TRUE(sample->audioBytes().empty());
    EXPECT_EQ(sample->sampleCount(), 1);
    sample->silence();  // nothing to do
}

TEST(SampleBufferTest, AudioSampleHasItsFormatBytesAndCount) {
    const auto sample = someAudio();
    EXPECT_FALSE(sample->isVideo());
    EXPECT_EQ(sample->audioFormat(), AudioFormatRecord::signed16(48000, 1));
    EXPECT_EQ(bytesOf(sample), someBytes());
    EXPECT_EQ(sample->sampleCount(), 2);
}

TEST(SampleBufferTest, TimesAreThoseOfTheFirstRecord) {
    const auto sample = someAudio();
    EXPECT_EQ(sample->duration(), kTiming.duration);
    EXPECT_EQ(sample->presentationTime(), kTiming.presentationTime);
    EXPECT_EQ(sample->decodeTime(), kTiming.decodeTime);
    ASSERT_EQ(sample->timing().size(), 1U);
    EXPECT_EQ(sample->timing().front(), kTiming);
}

TEST(SampleBufferTest, CaptureTimeIsTheFirstPresentationTimeAndStaysInCopies) {
    const auto sample = someAudio();
    EXPECT_EQ(sample->captureTime(), kTiming.presentationTime);
    const auto copy = sample->copyWithTiming(std::span(&kOtherTiming, 1));
    EXPECT_EQ(copy->presentationTime(), kOtherTiming.presentationTime);
    EXPECT_EQ(copy->captureTime(), kTiming.presentationTime);
}

TEST(SampleBufferTest, CopySharesTheContentAndHasTimesOfItsOwn) {
    const auto sample = someAudio();
    const TimingRecord records[] = {kOtherTiming, kTiming};
    const auto copy = sample->copyWithTiming(records);
    ASSERT_NE(copy, nullptr);
    EXPECT_EQ(copy->audioBytes().data(), sample->audioBytes().data());
    EXPECT_EQ(copy->sampleCount(), 2);
    EXPECT_EQ(copy->presentationTime(), kOtherTiming.presentationTime);
    EXPECT_EQ(copy->timing().size(), 2U);
    EXPECT_EQ(sample->presentationTime(), kTiming.presentationTime);
}

TEST(SampleBufferTest, CopyOfAVideoSampleSharesTheSurface) {
    const auto surface = *VideoSurface::create(VideoSurface::Geometry::packed(2, 2));
    const auto copy = SampleBuffer::video(surface, kTiming)->copyWithTiming(std::span(&kOtherTiming, 1));
    EXPECT_EQ(copy->surface(), surface);
}

TEST(SampleBufferTest, CopyWithoutTimesIsNone) {
    EXPECT_EQ(someAudio()->copyWithTiming({}), nullptr);
}

TEST(SampleBufferTest, SilenceIsHeardInEveryCopy) {
    const auto sample = someAudio();
    const auto copy = sample->copyWithTiming(std::span(&kOtherTiming, 1));
    copy->silence();
    EXPECT_EQ(bytesOf(sample), Bytes(4));
    EXPECT_EQ(bytesOf(copy), Bytes(4));
}

}  // namespace
}  // namespace kelvo
