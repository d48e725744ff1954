#include "MovieFixture.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <numbers>

namespace kelvo::test {
namespace {

constexpr double kRate = 44100;

/// How loud the 440 Hz tone is in a part of a track, from 0 to 1; other sound counts little.
double toneLevel(const std::vector<float>& sound, double from, double to, double hertz = 440) {
    double sine = 0;
    double cosine = 0;
    const auto first = static_cast<std::size_t>(from * kRate);
    const auto last = std::min(sound.size(), static_cast<std::size_t>(to * kRate));
    if (first >= last) return 0;
    for (std::size_t i = first; i < last; ++i) {
        const double phase = 2 * std::numbers::pi * hertz * static_cast<double>(i) / kRate;
        sine += sound[i] * std::sin(phase);
        cosine += sound[i] * std::cos(phase);
    }
    return 2 * std::hypot(sine, cosine) / static_cast<double>(last - first);
}

/// Where the loudest moment lies, in seconds.
double peakTime(const std::vector<float>& sound, double from, double to) {
    const auto first = sound.begin() + static_cast<std::ptrdiff_t>(from * kRate);
    const auto last =
        sound.begin() + static_cast<std::ptrdiff_t>(std::min(to * kRate, static_cast<double>(sound.size())));
    const auto peak =
        std::max_element(first, last, [](float a, float b) { return std::abs(a) < std::abs(b); });
    return static_cast<double>(peak - sound.begin()) / kRate;
}

class AudioTrackTest : public MovieFixture {
  protected:
    AudioTrackTest() : movie(service, path, {}) {
        EXPECT_TRUE(movie.start());
        movie.appendWhenReady(movie.video(), testFrame({320, 240}, 0, movie.timeAt(0)));
    }

    void append(const SampleBufferRef& sample) { movie.appendWhenReady(movie.audio1(), sample); }
    /// The tone from one moment to another, in buffers of 10 ms.
    void appendTone(double from, double to) {
        const auto count = std::llround((to - from) * 100);
        for (std::int64_t i = 0; i < count; ++i)
            append(testTone(movie.timeAt(from + static_cast<double>(i) * 0.01), 441));
    }
    /// Tells of a frame that was captured at one moment and is presented at another.
    void frame(double captured, double presented) {
        movie.writer()->relateTimes(MediaTime::make(movie.timeAt(captured), 1000000000),
                                    MediaTime::make(movie.timeAt(presented), 1000000000));
    }
    std::vector<float> finish() {
        EXPECT_EQ(movie.finish(), Status::completed);
        EXPECT_EQ(decodingComplaints(path), "");
        return decodedSound(path, "a:0");
    }

    TestMovie movie;
};

TEST_F(AudioTrackTest, SoundIsWhereItsTimesSay) {
    appendTone(0.5, 1);
    const auto sound = finish();
    EXPECT_LT(toneLevel(sound, 0, 0.48), 0.02);
    EXPECT_NEAR(toneLevel(sound, 0.52, 0.98), 0.5, 0.05);
    EXPECT_NEAR(frameTimes(path, "a:0").at(0), 0.5, 0.025);
}

TEST_F(AudioTrackTest, GapBecomesSilence) {
    appendTone(0, 0.5);
    appendTone(1.5, 2);
    const auto sound = finish();
    EXPECT_NEAR(toneLevel(sound, 0.05, 0.48), 0.5, 0.05);
    EXPECT_LT(toneLevel(sound, 0.52, 1.48), 0.02);
    EXPECT_NEAR(toneLevel(sound, 1.52, 1.98), 0.5, 0.05);
    EXPECT_NEAR(static_cast<double>(sound.size()) / kRate, 2, 0.03);
}

TEST_F(AudioTrackTest, LongGapCostsLittleAndKeepsItsLength) {
    appendTone(0, 0.5);
    appendTone(600.25, 600.75);
    EXPECT_EQ(movie.finish(), Status::completed);
    EXPECT_NEAR(std::atof(probeFormat(path, "duration").c_str()), 600.75, 0.03);
}

TEST_F(AudioTrackTest, OverlapIsCut) {
    appendTone(0, 1);
    appendTone(0.5, 2);
    const auto sound = finish();
    EXPECT_NEAR(static_cast<double>(sound.size()) / kRate, 2, 0.03);
    EXPECT_NEAR(toneLevel(sound, 0.9, 1.1), 0.5, 0.05);  // phase runs on through the cut
    EXPECT_NEAR(toneLevel(sound, 1.1, 1.98), 0.5, 0.05);
}

TEST_F(AudioTrackTest, SoundThatIsRepeatedWholeIsDropped) {
    appendTone(0, 1);
    appendTone(0, 1);
    EXPECT_NEAR(static_cast<double>(finish().size()) / kRate, 1, 0.03);
}

TEST_F(AudioTrackTest, SoundAfterAPauseIsInStepToTheSample) {
    const auto click = [&](double captured) {
        SampleBufferRef buffer = testTone(movie.timeAt(captured), 441, 440, 0);
        Bytes bytes(buffer->audioBytes().begin(), buffer->audioBytes().end());
        const std::int16_t loud = 30000;
        for (std::size_t i = 0; i < 4; ++i)
            std::memcpy(bytes.data() + i * 4, &loud, 2);
        append(SampleBuffer::audio(buffer->audioFormat(), bytes, 441, buffer->timing().front()));
    };
    const auto silence = [&](double from, double to) {
        for (std::int64_t i = 0; i < std::llround((to - from) * 100); ++i)
            append(testTone(movie.timeAt(from + static_cast<double>(i) * 0.01), 441, 440, 0));
    };
    frame(0, 0);
    frame(1, 1);
    silence(0, 0.8);
    click(0.8);
    silence(0.81, 1.003);  // the seam is off by less than any gap that would be filled
    frame(6.5, 1);
    silence(6.5, 7);
    frame(7.4, 1.9);
    click(7);
    silence(7.01, 7.4);
    const auto sound = finish();
    EXPECT_NEAR(peakTime(sound, 0.5, 1), 0.8, 0.0002);
    EXPECT_NEAR(peakTime(sound, 1.2, 1.9), 1.5, 0.0002);
    EXPECT_NEAR(static_cast<double>(sound.size()) / kRate, 1.9, 0.03);
}

TEST_F(AudioTrackTest, SoundOfAStillScreenBeforeAPauseIsNotMixedWithWhatFollows) {
    frame(0, 0);
    appendTone(0, 1);  // nothing moves on the screen for a second
    frame(5, 0);
    for (int i = 0; i < 150; ++i)
        append(testTone(movie.timeAt(5 + i * 0.01), 441, 1000));
    frame(6.5, 1.5);
    const auto sound = finish();
    // What was encoded before the pause was known stays.
    EXPECT_NEAR(toneLevel(sound, 0.05, 0.95) + toneLevel(sound, 0.05, 0.95, 1000), 0.5, 0.05);
    EXPECT_NEAR(toneLevel(sound, 1.05, 1.45, 1000), 0.5, 0.05);
    EXPECT_NEAR(static_cast<double>(sound.size()) / kRate, 1.5, 0.03);
}

TEST_F(AudioTrackTest, AbsurdTimesAreDropped) {
    appendTone(0, 0.5);
    append(testTone(std::int64_t{1} << 62, 441));
    append(testTone(-(std::int64_t{1} << 62), 441));
    const TimingRecord none;
    append(testTone(0, 441)->copyWithTiming(std::span(&none, 1)));
    appendTone(0.5, 1);
    EXPECT_NEAR(toneLevel(finish(), 0.05, 0.98), 0.5, 0.05);
}

/// A source whose clock runs wrong by so much: clicks that are a second apart by the movie's clock must stay
/// so.
class ClockTest : public AudioTrackTest, public ::testing::WithParamInterface<double> {};

TEST_P(ClockTest, TrackDoesNotDriftFromTheMoviesClock) {
    constexpr double kBuffer = 0.01;
    constexpr int kSeconds = 60;
    // The source makes this many samples in a second of the movie's clock.
    const double sourceRate = kRate * (1 + GetParam());
    std::int64_t made = 0;
    double nextClick = 1;
    while (static_cast<double>(made) / sourceRate < kSeconds) {
        const double at = static_cast<double>(made) / sourceRate;
        const auto count = static_cast<std::int64_t>(kBuffer * kRate);
        SampleBufferRef buffer = testTone(movie.timeAt(at), count, 440, 0);
        const auto click = static_cast<std::int64_t>((nextClick - at) * sourceRate);
        if (click >= 0 && click < count) {
            Bytes bytes(buffer->audioBytes().begin(), buffer->audioBytes().end());
            const std::int16_t loud = 30000;
            for (std::int64_t i = click; i < std::min(click + 4, count); ++i)
                std::memcpy(bytes.data() + i * 4, &loud, 2);
            buffer = SampleBuffer::audio(buffer->audioFormat(), bytes, count, buffer->timing().front());
            nextClick += 1;
        }
        append(buffer);
        made += count;
    }
    const auto sound = finish();
    for (int second = 1; second < kSeconds - 1; ++second)
        EXPECT_NEAR(peakTime(sound, second - 0.4, second + 0.4), second, 0.013);
}

INSTANTIATE_TEST_SUITE_P(Differences, ClockTest, ::testing::Values(0.0, 0.0002, -0.0002, 0.003, -0.003));

/// A linear PCM format and how a sample is written in it.
struct PcmCase {
    const char* name;
    double rate;
    std::uint32_t flags;
    std::uint32_t bits;
    std::uint32_t container;  ///< bytes
    std::uint32_t channels;
};

Bytes encoded(double level, const PcmCase& format) {
    std::uint64_t raw = 0;
    if ((format.flags & kAudioFlagFloat) != 0) {
        raw = format.bits == 64 ? std::bit_cast<std::uint64_t>(level)
                                : std::bit_cast<std::uint32_t>(static_cast<float>(level));
    } else {
        const double half = std::pow(2, format.bits - 1);
        const double value = std::floor(level * (half - 1));
        const bool isSigned = (format.flags & kAudioFlagSignedInteger) != 0;
        raw = static_cast<std::uint64_t>(static_cast<std::int64_t>(isSigned ? value : value + half));
        if (format.bits < 64) raw &= (std::uint64_t{1} << format.bits) - 1;
        if ((format.flags & kAudioFlagAlignedHigh) != 0) raw <<= format.container * 8 - format.bits;
    }
    Bytes bytes;
    for (std::uint32_t i = 0; i < format.container; ++i)
        bytes.push_back(static_cast<std::byte>(raw >> 8 * i));
    if ((format.flags & kAudioFlagBigEndian) != 0) std::ranges::reverse(bytes);
    return bytes;
}

/// The tone in that format, the same in all channels.
SampleBufferRef pcmTone(const PcmCase& format, std::int64_t start, double from, double seconds) {
    const auto count = static_cast<std::int64_t>(seconds * format.rate);
    const bool isPlanar = (format.flags & kAudioFlagNonInterleaved) != 0;
    Bytes channel;
    Bytes interleaved;
    for (std::int64_t i = 0; i < count; ++i) {
        const double time = from + static_cast<double>(i) / format.rate;
        const Bytes sample = encoded(0.5 * std::sin(2 * std::numbers::pi * 440 * time), format);
        channel.insert(channel.end(), sample.begin(), sample.end());
        for (std::uint32_t c = 0; c < format.channels; ++c)
            interleaved.insert(interleaved.end(), sample.begin(), sample.end());
    }
    Bytes planar;
    for (std::uint32_t c = 0; c < format.channels; ++c)
        planar.insert(planar.end(), channel.begin(), channel.end());
    AudioFormatRecord record;
    record.sampleRate = format.rate;
    record.formatIdentifier = kLinearPCMFormat;
    record.formatFlags = format.flags;
    record.framesPerPacket = 1;
    record.channelsPerFrame = format.channels;
    record.bitsPerChannel = format.bits;
    record.bytesPerFrame = format.container * (isPlanar ? 1 : format.channels);
    record.bytesPerPacket = record.bytesPerFrame;
    TimingRecord timing;
    timing.presentationTime = MediaTime::make(start + std::llround(from * kSecond), 1000000000);
    return SampleBuffer::audio(record, isPlanar ? planar : interleaved, count, timing);
}

class PcmFormatTest : public AudioTrackTest, public ::testing::WithParamInterface<PcmCase> {};

TEST_P(PcmFormatTest, EveryLinearPCMIsConverted) {
    for (int i = 0; i < 10; ++i)
        append(pcmTone(GetParam(), movie.timeAt(0), i * 0.05, 0.05));
    const auto sound = finish();
    EXPECT_NEAR(static_cast<double>(sound.size()) / kRate, 0.5, 0.03);
    // Adding up several channels that say the same may make them louder, never wrong.
    const double level = toneLevel(sound, 0.05, 0.45);
    EXPECT_GT(level, 0.3);
    EXPECT_LT(level, 1.01);
}

constexpr std::uint32_t kSigned = kAudioFlagSignedInteger;
constexpr std::uint32_t kPacked = kAudioFlagPacked;
constexpr std::uint32_t kBig = kAudioFlagBigEndian;

INSTANTIATE_TEST_SUITE_P(
    Formats, PcmFormatTest,
    ::testing::Values(
        PcmCase{"Unsigned8Mono8kHz", 8000, kPacked, 8, 1, 1},
        PcmCase{"Signed8Stereo11kHz", 11025, kSigned | kPacked, 8, 1, 2},
        PcmCase{"Signed16Big22kHz", 22050, kSigned | kPacked | kBig, 16, 2, 2},
        PcmCase{"Unsigned16", 48000, kPacked, 16, 2, 2},
        PcmCase{"Signed20In24High", 48000, kSigned | kAudioFlagAlignedHigh, 20, 3, 2},
        PcmCase{"Signed20In32Low", 48000, kSigned, 20, 4, 2},
        PcmCase{"Signed24Packed", 44100, kSigned | kPacked, 24, 3, 1},
        PcmCase{"Signed24BigIn32High", 96000, kSigned | kAudioFlagAlignedHigh | kBig, 24, 4, 2},
        PcmCase{"Signed32SixChannels", 48000, kSigned | kPacked, 32, 4, 6},
        PcmCase{"Float32EightChannels", 192000, kAudioFlagFloat | kPacked, 32, 4, 8},
        PcmCase{"Float32BigPlanar", 44100, kAudioFlagFloat | kBig | kAudioFlagNonInterleaved, 32, 4, 2},
        PcmCase{"Float64", 48000, kAudioFlagFloat | kPacked, 64, 8, 2},
        PcmCase{"Signed16PlanarThreeChannels", 32000, kSigned | kAudioFlagNonInterleaved, 16, 2, 3}),
    [](const auto& format) { return format.param.name; });

TEST_F(AudioTrackTest, FormatMayChangeOnTheWay) {
    append(pcmTone({"", 44100, kSigned | kPacked, 16, 2, 2}, movie.timeAt(0), 0, 0.5));
    append(pcmTone({"", 48000, kAudioFlagFloat | kPacked, 32, 4, 1}, movie.timeAt(0), 0.5, 0.5));
    const auto sound = finish();
    EXPECT_NEAR(toneLevel(sound, 0.05, 0.45), 0.5, 0.05);
    EXPECT_NEAR(toneLevel(sound, 0.55, 0.95), 0.5, 0.16);  // one channel becomes two, 3 dB lower each
}

TEST_F(AudioTrackTest, FormatsThatAreNoLinearPCMAreLoggedOnceAndDropped) {
    const std::vector<PcmCase> bad{{"", 44100, kSigned, 4, 1, 2},  {"", 44100, kSigned, 33, 8, 2},
                                   {"", 44100, kSigned, 16, 1, 2}, {"", 44100, kAudioFlagFloat, 16, 2, 2},
                                   {"", 4000, kSigned, 16, 2, 2},  {"", 400000, kSigned, 16, 2, 2},
                                   {"", 44100, kSigned, 16, 2, 9}};
    for (const PcmCase& format : bad)
        append(pcmTone(format, movie.timeAt(0), 0, 0.01));
    AudioFormatRecord none;
    append(SampleBuffer::audio(none, {}, 100, {}));
    append(SampleBuffer::audio(AudioFormatRecord::signed16(44100, 2), Bytes(10), -5, {}));
    appendTone(0, 0.5);
    EXPECT_NEAR(toneLevel(finish(), 0.05, 0.45), 0.5, 0.05);
    EXPECT_EQ(log.count("dropping audio: not a linear PCM format"), 1U);
}

TEST_F(AudioTrackTest, BuffersOfOneMomentDoNotBlockTheInput) {
    for (int i = 0; i < 100; ++i)
        append(testTone(movie.timeAt(0), 441));
    appendTone(0.01, 0.5);
    EXPECT_NEAR(static_cast<double>(finish().size()) / kRate, 0.5, 0.03);
}

TEST_F(AudioTrackTest, ShortBufferGivesWhatItHolds) {
    TimingRecord timing;
    timing.presentationTime = MediaTime::make(movie.timeAt(0), 1000000000);
    append(SampleBuffer::audio(AudioFormatRecord::signed16(44100, 2), Bytes(4 * 4410), 1000000, timing));
    EXPECT_NEAR(static_cast<double>(finish().size()) / kRate, 0.1, 0.03);
}

}  // namespace
}  // namespace kelvo::test
