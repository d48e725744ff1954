#include "SoundFixture.h"
#include "platform/linux/media/AacBitstream.h"

#include <algorithm>

namespace kelvo::test {
namespace {

struct Mono {
    Packets packets;
    Bytes configuration;
};

Mono encodedMono(const Samples& samples, std::int64_t bitRate) {
    Mono mono;
    auto encoder = AacEncoder::open({.bitRate = bitRate}, 1);
    const auto keep = [&](std::span<const std::byte> frame, std::int64_t) {
        mono.packets.emplace_back(frame.begin(), frame.end());
        return OptionalError();
    };
    const std::span<const float> all(samples);
    for (std::size_t at = 0; at < all.size(); at += encoder->frameSize()) {
        const auto frame = all.subspan(at, std::min(encoder->frameSize(), all.size() - at));
        EXPECT_FALSE(encoder->encode(frame, {}, keep));
    }
    EXPECT_FALSE(encoder->flush(keep));
    mono.configuration.assign(encoder->configuration().begin(), encoder->configuration().end());
    return mono;
}

Packets asStereo(const Packets& mono) {
    Packets stereo;
    for (const Bytes& frame : mono) {
        const auto converted = aacStereoFrame(frame);
        EXPECT_TRUE(converted) << "frame " << stereo.size();
        stereo.push_back(converted ? *converted : Bytes());
    }
    return stereo;
}

/// The window sequence is said in the third byte of a single channel's frame; 2 are eight short ones.
bool hasShortWindows(const Packets& mono) {
    return std::ranges::any_of(mono,
                               [](const Bytes& frame) { return std::to_integer<int>(frame[2]) >> 6 == 2; });
}

void expectSameSoundLeftAndRight(const Samples& samples, std::int64_t bitRate) {
    const Mono mono = encodedMono(samples, bitRate);
    const auto expected = decoded(mono.packets, mono.configuration);
    const auto stereo = decoded(asStereo(mono.packets), aacStereoConfiguration(mono.configuration));
    ASSERT_EQ(expected.size(), 1U);
    ASSERT_EQ(stereo.size(), 2U);
    EXPECT_GE(expected[0].size(), samples.size());
    EXPECT_EQ(stereo[0], expected[0]);
    EXPECT_EQ(stereo[1], expected[0]);
}

TEST(AacBitstreamTest, ToneIsTheSameLeftAndRight) {
    expectSameSoundLeftAndRight(sine(2 * kTestRate, 440), 128000);
}

TEST(AacBitstreamTest, SilenceIsTheSameLeftAndRight) {
    expectSameSoundLeftAndRight(Samples(kTestRate), 128000);
}

TEST(AacBitstreamTest, ClapsInShortWindowsAreTheSameLeftAndRight) {
    EXPECT_TRUE(hasShortWindows(encodedMono(claps(2 * kTestRate), 128000).packets));
    for (const std::int64_t bitRate : {24000, 64000, 128000, 256000})
        expectSameSoundLeftAndRight(claps(2 * kTestRate), bitRate);
}

TEST(AacBitstreamTest, NoiseShapedInTimeIsTheSameLeftAndRight) {
    for (const std::int64_t bitRate : {24000, 64000, 128000, 256000})
        expectSameSoundLeftAndRight(rasping(2 * kTestRate), bitRate);
}

TEST(AacBitstreamTest, NoiseOfTheDecodersOwnIsTheSameLeftAndRight) {
    for (const std::int64_t bitRate : {16000, 24000, 64000, 256000})
        expectSameSoundLeftAndRight(noise(2 * kTestRate), bitRate);
}

TEST(AacBitstreamTest, SecondChannelTakesFewBits) {
    const Packets mono = encodedMono(sine(kTestRate, 440), 128000).packets;
    const Packets stereo = asStereo(mono);
    for (std::size_t i = 0; i < mono.size(); ++i)
        EXPECT_LE(stereo[i].size(), mono[i].size() + 20) << "frame " << i;
}

TEST(AacBitstreamTest, WhatIsNoFrameOfOneChannelIsRefused) {
    const Mono mono = encodedMono(sine(kTestRate, 440), 128000);
    const Bytes stereo = asStereo(mono.packets).back();
    EXPECT_FALSE(aacStereoFrame(stereo));
    EXPECT_FALSE(aacStereoFrame(Bytes()));
    EXPECT_FALSE(aacStereoFrame(Bytes(100)));
    const auto refused = aacStereoFrame(Bytes(100, std::byte{0xFF}));
    ASSERT_FALSE(refused);
    EXPECT_EQ(refused.error().code(), kMediaErrorEncodingFailed);
}

TEST(AacBitstreamTest, FrameThatEndsEarlyIsRefusedOrStaysInItsBounds) {
    const Bytes frame = encodedMono(rasping(kTestRate), 128000).packets.at(20);
    for (std::size_t size = 0; size < 40; ++size)
        EXPECT_LE(aacStereoFrame(std::span(frame).first(size)).valueOr(Bytes()).size(), size + 40);
}

}  // namespace
}  // namespace kelvo::test
