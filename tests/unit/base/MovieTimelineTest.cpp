#include "base/MovieTimeline.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

MediaTime at(std::int64_t value) {
    return MediaTime::make(value, 1000000000);
}

TEST(MovieTimelineTest, WithoutFramesCapturedTimesAreThoseOfTheMovie) {
    const MovieTimeline timeline;
    EXPECT_TRUE(timeline.stretches().empty());
    EXPECT_EQ(timeline.sourceTime(at(7)), at(7));
    EXPECT_FALSE(timeline.start().isValid());
}

TEST(MovieTimelineTest, FramesOfOneShiftAreOneStretch) {
    MovieTimeline timeline;
    timeline.relate(at(100), at(90));
    timeline.relate(at(200), at(190));
    const auto stretches = timeline.stretches();
    ASSERT_EQ(stretches.size(), 1U);
    EXPECT_EQ(stretches[0].firstFrame, at(100));
    EXPECT_EQ(stretches[0].lastFrame, at(200));
    EXPECT_EQ(stretches[0].shift, at(10));
}

TEST(MovieTimelineTest, WhatLiesBetweenStretchesIsCutOut) {
    MovieTimeline timeline;
    timeline.relate(at(100), at(100));
    timeline.relate(at(200), at(200));
    timeline.relate(at(500), at(200));
    timeline.relate(at(600), at(300));
    EXPECT_EQ(timeline.sourceTime(at(50)), at(50)) << "before the first frame";
    EXPECT_EQ(timeline.sourceTime(at(200)), at(200));
    EXPECT_FALSE(timeline.sourceTime(at(201)).isValid());
    EXPECT_FALSE(timeline.sourceTime(at(499)).isValid());
    EXPECT_EQ(timeline.sourceTime(at(500)), at(200));
    EXPECT_EQ(timeline.sourceTime(at(900)), at(600)) << "after the last frame so far";
    EXPECT_FALSE(timeline.sourceTime(MediaTime::invalid()).isValid());
}

TEST(MovieTimelineTest, TimesThatAreNotValidRelateNothing) {
    MovieTimeline timeline;
    timeline.relate(MediaTime::invalid(), at(1));
    timeline.relate(at(1), MediaTime::invalid());
    EXPECT_TRUE(timeline.stretches().empty());
}

TEST(MovieTimelineTest, OnlyLaterMomentsAreBehindTheFrames) {
    MovieTimeline timeline;
    EXPECT_FALSE(timeline.isBehindTheFrames(at(5)));
    timeline.relate(at(5), at(5));
    timeline.relate(at(20), at(8));
    EXPECT_FALSE(timeline.isBehindTheFrames(MediaTime::invalid()));
    EXPECT_FALSE(timeline.isBehindTheFrames(at(20)));
    EXPECT_TRUE(timeline.isBehindTheFrames(at(21)));
}

TEST(MovieTimelineTest, OldStretchesAreForgotten) {
    MovieTimeline timeline;
    for (int i = 0; i < 1000; ++i)
        timeline.relate(at(1000 * i), at(i));
    const auto stretches = timeline.stretches();
    ASSERT_EQ(stretches.size(), MovieTimeline::kMostStretches);
    EXPECT_EQ(stretches.back().number, 999);
    EXPECT_EQ(timeline.sourceTime(at(999000)), at(999));
}

}  // namespace
}  // namespace kelvo
