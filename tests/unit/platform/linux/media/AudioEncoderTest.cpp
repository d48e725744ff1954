#include "SoundFixture.h"
#include "platform/linux/media/AudioEncoder.h"

#include <algorithm>

namespace kelvo::test {
namespace {

class AudioEncoderTest : public ::testing::Test {
  protected:
    AudioEncoderTest() { encoder->begin(0); }

    void expectContinuousTimes() const {
        std::int64_t next = -encoder->trackFormat().lead;
        for (const SampleTiming& time : times) {
            EXPECT_EQ(time.decodeTime, next);
            next += time.duration;
        }
    }
    /// Channel by channel, without what the decoder puts out before the first sample.
    std::vector<Samples> finish() {
        EXPECT_FALSE(encoder->flush());
        auto channels = decoded(packets, encoder->trackFormat().codecConfiguration);
        EXPECT_EQ(channels.size(), 2U);
        for (Samples& channel : channels)
            channel.erase(channel.begin(), channel.begin() + encoder->trackFormat().lead);
        expectContinuousTimes();
        return channels;
    }

    Packets packets;
    std::vector<SampleTiming> times;
    const std::unique_ptr<AudioEncoder> encoder =
        std::move(*AudioEncoder::open({}, [this](const SampleTiming& time, std::span<const std::byte> frame) {
            times.push_back(time);
            packets.emplace_back(frame.begin(), frame.end());
        }));
};

TEST_F(AudioEncoderTest, SameSoundLeftAndRightComesOutTheSame) {
    const Samples tone = sine(2 * kTestRate, 440);
    EXPECT_FALSE(encoder->samples(tone, tone));
    const auto channels = finish();
    EXPECT_EQ(channels[0], channels[1]);
    EXPECT_GT(distance(tone, channels[0], 0, tone.size()), 25);
}

TEST_F(AudioEncoderTest, DifferentSoundLeftAndRightComesOutDifferent) {
    const Samples left = sine(2 * kTestRate, 440);
    const Samples right = sine(2 * kTestRate, 1000);
    EXPECT_FALSE(encoder->samples(left, right));
    const auto channels = finish();
    EXPECT_GT(distance(left, channels[0], 0, left.size()), 20);
    EXPECT_GT(distance(right, channels[1], 0, right.size()), 20);
}

TEST_F(AudioEncoderTest, SecondChannelSetsInWithoutAGap) {
    const std::size_t change = kTestRate + 300;
    const Samples left = sine(2 * kTestRate, 440);
    Samples right = left;
    for (std::size_t i = change; i < right.size(); ++i)
        right[i] = -right[i] / 2;
    EXPECT_FALSE(encoder->samples(left, right));
    const auto channels = finish();
    const std::size_t step = 256;
    for (std::size_t at = 2048; at + step < left.size() - 2048; at += step) {
        EXPECT_GT(distance(left, channels[0], at, at + step), 12) << "left at " << at;
        if (at + 3 * 1024 < change || at > change + 2 * 1024) {  // the change itself is spread by each frame
            EXPECT_GT(distance(right, channels[1], at, at + step), 12) << "right at " << at;
        }
    }
}

enum WindowSequence { kLong, kStart, kShort, kStop };

/// The left channel's, in a frame of two.
WindowSequence windowSequenceOf(const Bytes& frame) {
    const auto bits = [&](std::size_t byte, int shift) { return std::to_integer<int>(frame[byte]) >> shift; };
    const bool haveLayoutInCommon = (bits(0, 0) & 1) != 0;  // else the channel's gain comes before
    return static_cast<WindowSequence>((haveLayoutInCommon ? bits(1, 5) : bits(2, 5)) & 3);
}

class SecondChannelAtTest : public AudioEncoderTest, public ::testing::WithParamInterface<int> {};
INSTANTIATE_TEST_SUITE_P(FramesFromAClap, SecondChannelAtTest, ::testing::Range(-4, 6));

TEST_P(SecondChannelAtTest, WindowsOfTheFramesFitTogether) {
    const Samples left = claps(2 * kTestRate);
    Samples right = left;
    const std::size_t change = kTestRate + static_cast<std::size_t>(1024 * GetParam());
    std::fill(right.begin() + static_cast<std::ptrdiff_t>(change), right.end(), 0.0F);
    EXPECT_FALSE(encoder->samples(left, right));
    const auto channels = finish();
    EXPECT_GT(distance(left, channels[0], 0, left.size()), 6);
    bool hadShort = false;
    WindowSequence before = kLong;
    for (const Bytes& frame : packets) {
        const WindowSequence sequence = windowSequenceOf(frame);
        const bool wasTowardsShort = before == kStart || before == kShort;
        EXPECT_EQ(sequence == kShort || sequence == kStop, wasTowardsShort)
            << sequence << " after " << before;
        hadShort |= sequence == kShort;
        before = sequence;
    }
    EXPECT_TRUE(hadShort);
}

TEST_F(AudioEncoderTest, FirstSampleMayDiffer) {
    EXPECT_FALSE(encoder->samples(Samples{1.0F}, Samples{0.0F}));
    EXPECT_FALSE(encoder->silence(5000));
    EXPECT_EQ(finish()[1], Samples(finish()[1].size()));
}

TEST_F(AudioEncoderTest, LongSilenceBeforeDifferentSoundKeepsItsLength) {
    const Samples left = sine(kTestRate, 440);
    EXPECT_FALSE(encoder->silence(60 * kTestRate));
    EXPECT_FALSE(encoder->samples(left, Samples(left.size())));
    const auto channels = finish();
    const Samples sound(channels[0].begin() + 60 * kTestRate, channels[0].end());
    EXPECT_GT(distance(left, sound, 0, left.size()), 20);
}

TEST_F(AudioEncoderTest, NothingEncodesToNothing) {
    EXPECT_FALSE(encoder->flush());
    EXPECT_TRUE(packets.empty());
}

}  // namespace
}  // namespace kelvo::test
