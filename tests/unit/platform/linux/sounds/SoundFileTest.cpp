#include "platform/linux/sounds/SoundFile.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

std::string little(std::uint32_t number, int size) {
    std::string bytes;
    for (int i = 0; i < size; ++i)
        bytes += static_cast<char>(number >> 8 * i & 0xFF);
    return bytes;
}

std::string part(const std::string& kind, const std::string& content) {
    return kind + little(static_cast<std::uint32_t>(content.size()), 4) + content +
           std::string(content.size() % 2, '\0');
}

std::string format(std::uint32_t kind, std::uint32_t channels, std::uint32_t rate, std::uint32_t bits) {
    return part("fmt ", little(kind, 2) + little(channels, 2) + little(rate, 4) +
                            little(rate * channels * bits / 8, 4) + little(channels * bits / 8, 2) +
                            little(bits, 2));
}

std::string wave(const std::string& parts) {
    return "RIFF" + little(static_cast<std::uint32_t>(parts.size() + 4), 4) + "WAVE" + parts;
}

std::string problemWith(const std::string& bytes) {
    const auto sound = SoundFile::parse(bytes);
    return sound ? "nothing" : sound.error().localizedDescription();
}

bool isRefused(const std::string& bytes, const std::string& reason) {
    return problemWith(bytes).find(reason) != std::string::npos;
}

TEST(SoundFileTest, SamplesAndTheirFormAreRead) {
    const auto sound =
        SoundFile::parse(wave(format(1, 2, 44100, 16) + part("LIST", "odd") + part("data", "12345678")));
    ASSERT_TRUE(sound) << sound.error().description();
    EXPECT_EQ(sound->rate, 44100U);
    EXPECT_EQ(sound->channels, 2);
    EXPECT_EQ(sound->samples, "12345678");
}

TEST(SoundFileTest, FrameThatIsCutIsLeftOut) {
    const auto sound = SoundFile::parse(wave(format(1, 2, 8000, 16) + part("data", "1234567")));
    ASSERT_TRUE(sound);
    EXPECT_EQ(sound->samples, "1234");
}

TEST(SoundFileTest, WhatIsNoWaveFileIsRefused) {
    EXPECT_TRUE(isRefused("", "not a WAVE file"));
    EXPECT_TRUE(isRefused("RIFF1234AVI ", "not a WAVE file"));
}

TEST(SoundFileTest, OtherFormsAreRefused) {
    const std::string data = part("data", "12345678");
    EXPECT_TRUE(isRefused(wave(format(1, 1, 44100, 8) + data), "not 16-bit PCM"));
    EXPECT_TRUE(isRefused(wave(format(3, 1, 44100, 16) + data), "not 16-bit PCM"));
    EXPECT_TRUE(isRefused(wave(part("fmt ", "short") + data), "not 16-bit PCM"));
    EXPECT_TRUE(isRefused(wave(format(1, 6, 44100, 16) + data), "neither mono nor stereo"));
    EXPECT_TRUE(isRefused(wave(format(1, 1, 7999, 16) + data), "neither mono nor stereo"));
    EXPECT_TRUE(isRefused(wave(format(1, 1, 96001, 16) + data), "neither mono nor stereo"));
    EXPECT_TRUE(isRefused(wave(data), "neither mono nor stereo"));
}

TEST(SoundFileTest, FileWithoutSoundIsRefused) {
    EXPECT_TRUE(isRefused(wave(format(1, 1, 44100, 16)), "no sound in it"));
    EXPECT_TRUE(isRefused(wave(format(1, 1, 44100, 16) + part("data", "1")), "no sound in it"));
}

TEST(SoundFileTest, FileThatIsCutShortIsRefused) {
    const std::string whole = wave(format(1, 1, 44100, 16) + part("data", "12345678"));
    EXPECT_TRUE(isRefused(whole.substr(0, whole.size() - 1), "a part of the file is missing"));
    for (std::size_t size = 0; size < whole.size(); ++size)
        EXPECT_NE(problemWith(whole.substr(0, size)), "nothing") << size;
}

}  // namespace
}  // namespace kelvo
