#include "MovieFixture.h"
#include "support/Eventually.h"

#include <cstdlib>

namespace kelvo::test {
namespace {

using MovieEndTest = MovieFixture;

TEST_F(MovieEndTest, MovieEndsExactlyWhereItsSessionWasEnded) {
    TestMovie movie(service, path, {});
    ASSERT_TRUE(movie.start());
    movie.recordUntil(2);
    movie.writer()->endSession(MediaTime::make(movie.timeAt(1.25), 1000000000));
    movie.finish();
    EXPECT_EQ(decodingComplaints(path), "");
    EXPECT_EQ(probeFormat(path, "duration"), "1.250000");
    EXPECT_LT(frameTimes(path, "v:0").back(), 1.25);
    EXPECT_EQ(frameTimes(path, "v:0").size(), 38U);
    EXPECT_NEAR(static_cast<double>(decodedSound(path, "a:0").size()) / 44100, 1.25, 0.024);
}

class CaptureEndTest : public MovieFixture {
  protected:
    CaptureEndTest() {
        EXPECT_TRUE(movie.start());
        showAt(0, 0);
    }
    void showAt(double captured, double presented) {
        movie.writer()->relateTimes(MediaTime::make(movie.timeAt(captured), kSecond),
                                    MediaTime::make(movie.timeAt(presented), kSecond));
        movie.appendWhenReady(movie.video(), testFrame({320, 240}, 0, movie.timeAt(presented)));
    }
    void endCapture(double captured) {
        movie.writer()->endCapture(MediaTime::make(movie.timeAt(captured), kSecond));
    }
    std::string finishedDuration() {
        EXPECT_EQ(movie.finish(), Status::completed);
        EXPECT_EQ(decodingComplaints(path), "");
        return probeFormat(path, "duration");
    }

    TestMovie movie{service, path, {}};
};

TEST_F(CaptureEndTest, PictureThatStandsStillLastsUntilThen) {
    endCapture(2.5);
    EXPECT_EQ(finishedDuration(), "2.500000");
    EXPECT_EQ(frameTimes(path, "v:0").size(), 1U);
}

TEST_F(CaptureEndTest, WhatPausesCutOutIsNotShown) {
    showAt(11, 1);
    endCapture(12);
    EXPECT_EQ(finishedDuration(), "2.000000");
}

TEST_F(CaptureEndTest, LaterFramesCountMore) {
    showAt(2, 2);
    endCapture(1.5);
    EXPECT_NEAR(std::atof(finishedDuration().c_str()), 2.03, 0.02);
    EXPECT_EQ(frameTimes(path, "v:0").size(), 2U);
}

TEST_F(CaptureEndTest, EndOfTheSessionCountsMore) {
    showAt(1, 1);
    endCapture(2.5);
    movie.writer()->endSession(MediaTime::make(movie.timeAt(1.5), kSecond));
    EXPECT_EQ(finishedDuration(), "1.500000");
}

TEST_F(MovieEndTest, FrameAtTheEndIsNotInTheMovie) {
    TestMovie movie(service, path, {});
    ASSERT_TRUE(movie.start());
    for (const int i : {0, 1, 2})
        movie.appendWhenReady(movie.video(), testFrame({320, 240}, i, movie.timeAt(i)));
    movie.writer()->endSession(MediaTime::make(movie.timeAt(2), 1000000000));
    movie.finish();
    EXPECT_EQ(frameTimes(path, "v:0").size(), 2U);
    EXPECT_EQ(probeFormat(path, "duration"), "2.000000");
}

TEST_F(MovieEndTest, UnfinishedMoviePlaysUpToItsLastFragment) {
    {
        TestMovie movie(service, path, {});
        ASSERT_TRUE(movie.start());
        movie.recordUntil(3);
    }
    EXPECT_EQ(boxTypes(path).substr(0, 24), "ftyp moov free moof mdat");
    EXPECT_EQ(decodingComplaints(path), "");
    EXPECT_GT(frameTimes(path, "v:0").back(), 2);
}

TEST_F(MovieEndTest, FrameAfterWhichNothingMovesIsWrittenAllTheSame) {
    TestMovie movie(service, path, {.hasAudio1 = false, .hasAudio2 = false});
    ASSERT_TRUE(movie.start());
    ASSERT_TRUE(movie.appendWhenReady(movie.video(), testFrame({320, 240}, 0, movie.timeAt(0))));
    EXPECT_TRUE(eventually([&] { return boxTypes(path) == "ftyp moov free moof mdat"; }));
    EXPECT_EQ(frameTimes(path, "v:0").size(), 1U);
}

}  // namespace
}  // namespace kelvo::test
