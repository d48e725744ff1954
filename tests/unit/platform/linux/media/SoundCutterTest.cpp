#include "platform/linux/media/SoundCutter.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using Joint = AudioAligner::Joint;

constexpr double kRate = 1000;  // a sample is a millisecond

MediaTime at(double seconds) {
    return MediaTime::fromSeconds(seconds, 1000000000);
}

class SoundCutterTest : public ::testing::Test {
  protected:
    struct Piece {
        double begin;
        double end;
        Joint joint;
        friend bool operator==(const Piece&, const Piece&) = default;
    };

    SoundCutterTest()
        : cutter([this](const PcmBlock& block, const MediaTime& time, Joint joint) {
              const double begin = time.seconds();
              const double end = begin + static_cast<double>(block.sampleCount()) / kRate;
              pieces.push_back({std::round(begin * kRate), std::round(end * kRate), joint});
              firstLevels.push_back(block.channels.at(0).at(0));
              return OptionalError();
          }) {}

    /// Frames from one captured moment to another, presented `shift` earlier.
    void frames(double from, double to, double shift) {
        timeline.relate(at(from), at(from - shift));
        timeline.relate(at(to), at(to - shift));
    }
    /// Sound whose samples tell their own captured moment, in milliseconds.
    void sound(double from, double to) {
        PcmBlock block{kRate, {{}}};
        for (double time = from; time < to - 1e-9; time += 1 / kRate)
            block.channels[0].push_back(static_cast<float>(std::round(time * kRate)));
        EXPECT_FALSE(cutter.add(std::move(block), at(from), timeline));
    }
    void flush() { EXPECT_FALSE(cutter.flush(timeline)); }

    MovieTimeline timeline;
    std::vector<Piece> pieces;
    std::vector<float> firstLevels;
    SoundCutter cutter;
};

TEST_F(SoundCutterTest, SoundWithoutFramesStaysWhereItWas) {
    sound(1, 1.1);
    sound(9, 9.1);
    EXPECT_EQ(pieces, (std::vector<Piece>{{1000, 1100, Joint::smooth}, {9000, 9100, Joint::smooth}}));
}

TEST_F(SoundCutterTest, SoundFollowsTheFramesShift) {
    frames(10, 12, 3);
    sound(10.5, 10.6);
    EXPECT_EQ(pieces, (std::vector<Piece>{{7500, 7600, Joint::smooth}}));
}

TEST_F(SoundCutterTest, SoundOfAPauseIsCutOut) {
    frames(0, 1, 0);
    frames(6, 7, 5);
    sound(0.9, 1.2);  // reaches into the pause
    sound(1.2, 5.8);  // within
    sound(5.8, 6.3);  // reaches out of it
    EXPECT_EQ(pieces, (std::vector<Piece>{{900, 1000, Joint::smooth}, {1000, 1300, Joint::exact}}));
    EXPECT_EQ(firstLevels, (std::vector<float>{900, 6000}));
}

TEST_F(SoundCutterTest, OneBlockMaySpanSeveralPauses) {
    frames(0, 1, 0);
    frames(2, 3, 1);
    frames(4, 5, 2);
    sound(0.5, 4.5);
    EXPECT_EQ(pieces,
              (std::vector<Piece>{
                  {500, 1000, Joint::smooth}, {1000, 2000, Joint::exact}, {2000, 2500, Joint::exact}}));
}

TEST_F(SoundCutterTest, SoundBeforeTheFirstFrameIsTheMoviesBusiness) {
    frames(5, 6, 0);
    sound(4.5, 5.5);
    EXPECT_EQ(pieces, (std::vector<Piece>{{4500, 5500, Joint::smooth}}));
}

TEST_F(SoundCutterTest, SoundAfterSilenceWaitsForTheNextFrame) {
    frames(0, 1, 0);
    sound(0.9, 1.0);
    sound(6.1, 6.2);
    sound(6.2, 6.3);
    EXPECT_EQ(pieces.size(), 1U);
    frames(6, 6.5, 5);
    sound(6.3, 6.4);
    EXPECT_EQ(pieces, (std::vector<Piece>{{900, 1000, Joint::smooth},
                                          {1100, 1200, Joint::exact},
                                          {1200, 1300, Joint::smooth},
                                          {1300, 1400, Joint::smooth}}));
}

TEST_F(SoundCutterTest, FrameWithoutAPauseLetsTheSoundGoOn) {
    frames(0, 1, 0);
    sound(0.9, 1.0);
    sound(6.1, 6.2);
    frames(6, 6.5, 0);
    sound(6.2, 6.3);
    EXPECT_EQ(pieces,
              (std::vector<Piece>{
                  {900, 1000, Joint::smooth}, {6100, 6200, Joint::smooth}, {6200, 6300, Joint::smooth}}));
}

TEST_F(SoundCutterTest, SoundThatGoesOnDoesNotWaitForFrames) {
    frames(0, 0.1, 0);
    for (int i = 0; i < 50; ++i) {
        sound(i * 0.1, (i + 1) * 0.1);
        EXPECT_EQ(pieces.size(), static_cast<std::size_t>(i + 1));
    }
}

TEST_F(SoundCutterTest, ShortSilenceIsNoPause) {
    frames(0, 0.1, 0);
    sound(0, 0.3);
    sound(0.49, 0.6);
    EXPECT_EQ(pieces.size(), 2U);
}

TEST_F(SoundCutterTest, SoundOnAStillScreenWaitsForASecondAtMost) {
    frames(0, 0.1, 0);
    sound(0, 0.5);
    for (int i = 0; i < 9; ++i)
        sound(3 + i * 0.1, 3.1 + i * 0.1);
    EXPECT_EQ(pieces.size(), 1U);
    sound(3.9, 4.05);
    ASSERT_EQ(pieces.size(), 11U);
    EXPECT_EQ(pieces[1], (Piece{3000, 3100, Joint::smooth}));
}

TEST_F(SoundCutterTest, SoundThatComesLateToTheMovieWaitsToo) {
    frames(0, 0.1, 0);
    sound(6.1, 6.2);
    EXPECT_TRUE(pieces.empty());
    frames(6, 6.5, 5);
    sound(6.2, 6.3);
    EXPECT_EQ(pieces, (std::vector<Piece>{{1100, 1200, Joint::exact}, {1200, 1300, Joint::smooth}}));
}

TEST_F(SoundCutterTest, FlushHandsOverWhatWaits) {
    frames(0, 0.1, 0);
    sound(0, 0.5);
    sound(3, 3.1);
    EXPECT_EQ(pieces.size(), 1U);
    flush();
    EXPECT_EQ(pieces.size(), 2U);
}

/// Sound whose times make no sense neither waits for ever nor piles up.
TEST_F(SoundCutterTest, StrangeTimesDoNotPileUp) {
    frames(0, 0.1, 0);
    sound(0, 0.1);
    for (int i = 0; i < 40; ++i)
        sound(100 - i, 100.1 - i);
    EXPECT_GT(pieces.size(), 25U);
    EXPECT_FALSE(cutter.add({kRate, {{1, 2, 3}}}, MediaTime::invalid(), timeline));
    EXPECT_FALSE(cutter.add({kRate, {{}}}, at(1), timeline));
    const MediaTime far = MediaTime::make(std::numeric_limits<std::int64_t>::max(), 1);
    EXPECT_FALSE(cutter.add({kRate, {{1, 2, 3}}}, far, timeline));
    flush();
}

TEST_F(SoundCutterTest, FailureIsHandedBack) {
    SoundCutter failing([](const PcmBlock&, const MediaTime&, Joint) {
        return OptionalError(KVError::posix(ENOMEM, "test"));
    });
    EXPECT_TRUE(failing.add({kRate, {{1}}}, at(1), timeline));
}

}  // namespace
}  // namespace kelvo
