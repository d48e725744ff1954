#include "platform/FramePacer.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using namespace std::chrono_literals;
constexpr auto kInterval = 16ms;

TEST(FramePacer, FirstChangeIsDueAtOnce) {
    FramePacer pacer(kInterval);
    EXPECT_EQ(pacer.due(1000ms), 1000ms);
}

TEST(FramePacer, ChangeAfterALongPauseIsDueAtOnce) {
    FramePacer pacer(kInterval);
    pacer.captured(0ms, 0ms);
    EXPECT_EQ(pacer.due(500ms), 500ms);
}

TEST(FramePacer, ChangeRightAfterAFrameWaitsAtMostAnInterval) {
    FramePacer pacer(kInterval);
    pacer.captured(100ms, 100ms);
    const auto due = pacer.due(101ms);
    EXPECT_GT(due, 101ms);
    EXPECT_LE(due, 101ms + kInterval);
}

TEST(FramePacer, NeverMoreThanOneFrameAnIntervalOverTime) {
    FramePacer pacer(kInterval);
    std::chrono::nanoseconds now = 0ms;
    int frames = 0;
    while (now < 16s) {
        now = pacer.due(now);  // something changes all the time
        pacer.captured(now, now);
        ++frames;
        now += 1us;
    }
    EXPECT_GE(frames, 990);
    EXPECT_LE(frames, 1002);
}

TEST(FramePacer, OneLateFrameDoesNotDelayTheOnesAfterIt) {
    FramePacer pacer(kInterval);
    pacer.captured(0ms, 0ms);
    pacer.captured(16ms, 20ms);
    EXPECT_EQ(pacer.due(32ms), 32ms);
}

TEST(FramePacer, FramesAreNeverCloserThanHalfAnInterval) {
    FramePacer pacer(kInterval);
    pacer.captured(0ms, 1000ms);  // the consumer was busy for a second
    EXPECT_GE(pacer.due(1001ms), 1000ms + kInterval / 2);
}

}  // namespace
}  // namespace kelvo
