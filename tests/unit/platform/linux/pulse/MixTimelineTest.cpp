#include "platform/linux/pulse/MixTimeline.h"
#include "platform/linux/pulse/StreamClock.h"

#include <cstring>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::pulse {
namespace {

using namespace std::chrono_literals;
using testing::Each;
using testing::ElementsAre;

constexpr std::uint32_t kRate = 1000;  // a frame a millisecond
using Samples = std::vector<std::int16_t>;

class MixTimelineTest : public testing::Test {
  protected:
    Samples read(std::size_t frames) {
        std::vector<std::byte> bytes(frames * 2);
        timeline.read(bytes, false);
        Samples samples(frames);
        std::memcpy(samples.data(), bytes.data(), bytes.size());
        return samples;
    }

    MixTimeline timeline{10s, kRate, 1};
};

TEST_F(MixTimelineTest, NothingIsReadableBeforeItsTime) {
    EXPECT_EQ(timeline.readableFrames(10s), 0);
    EXPECT_EQ(timeline.readableFrames(9s), 0);
    EXPECT_EQ(timeline.position(), 10s);
}

TEST_F(MixTimelineTest, SilenceIsReadableSoonWithoutAnyStream) {
    EXPECT_EQ(timeline.readableFrames(10s + MixTimeline::kSettling + 7ms), 7);
    EXPECT_THAT(read(7), Each(0));
    EXPECT_EQ(timeline.position(), 10s + 7ms);
    EXPECT_EQ(timeline.framesRead(), 7);
}

TEST_F(MixTimelineTest, SoundIsReadableOnceEveryStreamHasComePastIt) {
    const auto first = timeline.addStream(10s);
    const auto second = timeline.addStream(10s);
    timeline.write(first, 10s, Samples(100, 1));
    EXPECT_EQ(timeline.readableFrames(10s + 150ms), 0);
    timeline.write(second, 10s, Samples(50, 2));
    EXPECT_EQ(timeline.readableFrames(10s + 150ms), 50);
    EXPECT_THAT(read(50), Each(3));
}

TEST_F(MixTimelineTest, LateStreamIsNotWaitedForLongerThanPatience) {
    const auto late = timeline.addStream(10s);
    EXPECT_EQ(timeline.readableFrames(10s + MixTimeline::kPatience + 5ms), 5);
    read(5);
    timeline.write(late, 10s, Samples{1, 2, 3, 4, 5, 6, 7});
    EXPECT_THAT(read(3), ElementsAre(6, 7, 0)) << "what came too late is lost";
}

TEST_F(MixTimelineTest, StreamThatWentIsNotWaitedFor) {
    const auto stream = timeline.addStream(10s);
    timeline.removeStream(stream);
    EXPECT_EQ(timeline.readableFrames(10s + MixTimeline::kSettling + 7ms), 7);
}

TEST_F(MixTimelineTest, StreamThatComesLaterHoldsUpOnlyWhatComesLater) {
    timeline.addStream(10s + 100ms);
    EXPECT_EQ(timeline.readableFrames(10s + 180ms), 100);
}

TEST_F(MixTimelineTest, SoundStandsAtItsMoment) {
    const auto stream = timeline.addStream(10s);
    timeline.write(stream, 10s + 3ms, Samples{7, 8});
    EXPECT_THAT(read(6), ElementsAre(0, 0, 0, 7, 8, 0));
}

TEST_F(MixTimelineTest, LoudSumsAreClipped) {
    const auto first = timeline.addStream(10s);
    const auto second = timeline.addStream(10s);
    timeline.write(first, 10s, Samples{30000, -30000});
    timeline.write(second, 10s, Samples{30000, -30000});
    EXPECT_THAT(read(2), ElementsAre(32767, -32768));
}

TEST_F(MixTimelineTest, BytesAreInTheOrderThatWasAskedFor) {
    const auto stream = timeline.addStream(10s);
    timeline.write(stream, 10s, Samples{0x1234, 0x1234});
    std::vector<std::byte> bytes(2);
    timeline.read(bytes, true);
    EXPECT_THAT(bytes, ElementsAre(std::byte{0x12}, std::byte{0x34}));
    timeline.read(bytes, false);
    EXPECT_THAT(bytes, ElementsAre(std::byte{0x34}, std::byte{0x12}));
}

TEST_F(MixTimelineTest, BlocksThatFollowCloselyHaveNoSeam) {
    const auto stream = timeline.addStream(10s);
    timeline.write(stream, 10s, Samples(10, 1));
    timeline.write(stream, 10s + 11ms, Samples(10, 1));  // a millisecond is within what is heard as one
    EXPECT_THAT(read(20), Each(1));
}

TEST_F(MixTimelineTest, BlocksThatDriftAreStretchedFrameByFrame) {
    const auto stream = timeline.addStream(10s);
    timeline.write(stream, 10s, Samples(10, 1));
    for (int block = 1; block <= 3; ++block)
        timeline.write(stream, 10s + block * 10ms + 6ms, Samples(10, 1));
    EXPECT_THAT(read(42), Each(1)) << "two blocks of eleven, until four milliseconds are left";
    EXPECT_THAT(read(5), Each(0));
}

TEST_F(MixTimelineTest, BlocksThatLagAreShortened) {
    const auto stream = timeline.addStream(10s);
    timeline.write(stream, 10s, Samples(10, 1));
    timeline.write(stream, 10s + 5ms, Samples(10, 1));
    EXPECT_THAT(read(19), Each(1));
    EXPECT_THAT(read(1), Each(0));
}

TEST_F(MixTimelineTest, RealGapStaysAGap) {
    const auto stream = timeline.addStream(10s);
    timeline.write(stream, 10s, Samples(2, 1));
    timeline.write(stream, 10s + 102ms, Samples(2, 1));
    EXPECT_THAT(read(2), Each(1));
    EXPECT_THAT(read(100), Each(0));
    EXPECT_THAT(read(2), Each(1));
}

TEST_F(MixTimelineTest, StreamThatFallsBackDoesNotSoundTwice) {
    const auto stream = timeline.addStream(10s);
    timeline.write(stream, 10s, Samples(20, 1));
    timeline.write(stream, 10s + 5ms, Samples(20, 1));
    timeline.write(stream, 10s + 1ms, Samples(5, 1));
    EXPECT_THAT(read(25), Each(1));
    EXPECT_THAT(read(5), Each(0));
}

TEST_F(MixTimelineTest, StreamThatWasPutTooFarAheadOnceIsHeardAgainAtOnce) {
    const auto stream = timeline.addStream(10s);
    timeline.write(stream, 10s, Samples(20, 1));
    timeline.write(stream, 12s, Samples(20, 1));
    timeline.write(stream, 10s + 20ms, Samples(20, 1));
    timeline.write(stream, 10s + 40ms, Samples(20, 1));
    EXPECT_EQ(timeline.readableFrames(10s + 150ms), 60) << "it is waited for again";
    EXPECT_THAT(read(60), Each(1));
}

TEST_F(MixTimelineTest, StreamThatWasPutBeyondTheReachGoesOnWhereItWas) {
    const auto stream = timeline.addStream(10s);
    timeline.write(stream, 10s, Samples(20, 1));
    timeline.write(stream, 10s + 24h, Samples(20, 9));
    timeline.write(stream, 10s + 20ms, Samples(20, 1));
    EXPECT_THAT(read(40), Each(1));
    EXPECT_THAT(read(4000), Each(0));
}

TEST_F(MixTimelineTest, SoundBeyondTheReachIsLost) {
    const auto stream = timeline.addStream(10s);
    timeline.write(stream, 10s + MixTimeline::kReach, Samples{5});
    timeline.write(stream, 10s + MixTimeline::kReach + 24h, Samples{5});
    EXPECT_THAT(read(4001), Each(0));
}

TEST_F(MixTimelineTest, RingIsCleanWhenItComesRound) {
    const auto stream = timeline.addStream(10s);
    for (int round = 0; round < 3; ++round) {
        timeline.write(stream, timeline.position(), Samples(3000, 9));
        EXPECT_THAT(read(3000), Each(9));
        EXPECT_THAT(read(500), Each(0));
    }
}

TEST_F(MixTimelineTest, StreamsAreLimited) {
    for (std::size_t i = 0; i < MixTimeline::kMostStreams; ++i)
        EXPECT_NE(timeline.addStream(10s), MixTimeline::kNoStream);
    const auto none = timeline.addStream(10s);
    EXPECT_EQ(none, MixTimeline::kNoStream);
    timeline.write(none, 10s, Samples{1});
    timeline.removeStream(none);
    EXPECT_THAT(read(1), Each(0));
}

TEST_F(MixTimelineTest, EmptyAndHalfFramesAreIgnored) {
    MixTimeline stereo(10s, kRate, 2);
    const auto stream = stereo.addStream(10s);
    stereo.write(stream, 10s, Samples{1});
    stereo.write(stream, 10s, Samples{1, 2, 3});
    std::vector<std::byte> bytes(8);
    stereo.read(bytes, false);
    EXPECT_THAT(bytes, ElementsAre(std::byte{1}, std::byte{0}, std::byte{2}, std::byte{0}, std::byte{0},
                                   std::byte{0}, std::byte{0}, std::byte{0}));
}

TEST(StreamClockTest, FramesAndDurationsDoNotOverflowInAYear) {
    const auto year = durationOf(44100LL * 3600 * 24 * 365, 44100);
    EXPECT_EQ(year, 24h * 365);
    EXPECT_EQ(framesIn(year, 44100), 44100LL * 3600 * 24 * 365);
}

TEST(StreamClockTest, FirstBlockStandsWhereTheServerPutsIt) {
    StreamClock clock(kRate);
    EXPECT_EQ(clock.place(5s, 20), 5s);
}

TEST(StreamClockTest, BlocksFollowOneAnotherDespiteJitter) {
    StreamClock clock(kRate);
    auto end = clock.place(5s, 20) + 20ms;
    for (int i = 1; i < 200; ++i) {
        const auto jitter = i % 2 == 0 ? 2ms : -2ms;
        const auto begin = clock.place(5s + i * 20ms + jitter, 20);
        EXPECT_LT(std::chrono::abs(begin - end), 50us);
        EXPECT_LT(std::chrono::abs(begin - (5s + i * 20ms)), 1ms);
        end = begin + 20ms;
    }
}

TEST(StreamClockTest, BlocksFollowAClockThatDrifts) {
    StreamClock clock(kRate);
    std::chrono::nanoseconds begin{};
    std::chrono::nanoseconds truth{};
    for (int i = 0; i < 30000; ++i) {  // ten minutes at 100 millionths too slow
        truth = 5s + i * 20ms + i * 2us;
        begin = clock.place(truth, 20);
    }
    EXPECT_LT(std::chrono::abs(begin - truth), 1ms);
}

TEST(StreamClockTest, LeapIsFollowedAtOnce) {
    StreamClock clock(kRate);
    clock.place(5s, 20);
    EXPECT_EQ(clock.place(6s, 20), 6s);
    EXPECT_EQ(clock.place(5s, 20), 5s);
}

TEST(StreamClockTest, WrongFirstEstimateIsMadeUpForInASecond) {
    StreamClock clock(kRate);
    clock.place(5s + 25ms, 20);
    std::chrono::nanoseconds begin{};
    for (int i = 1; i < 50; ++i)
        begin = clock.place(5s + i * 20ms, 20);
    EXPECT_LT(std::chrono::abs(begin - (5s + 49 * 20ms)), 5ms);
}

TEST(StreamClockTest, ResetBeginsAnew) {
    StreamClock clock(kRate);
    clock.place(5s, 20);
    clock.reset();
    EXPECT_EQ(clock.place(5s + 30ms, 20), 5s + 30ms);
}

}  // namespace
}  // namespace kelvo::pulse
