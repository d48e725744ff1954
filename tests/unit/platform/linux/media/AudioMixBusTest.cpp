#include "platform/linux/media/AudioMixBus.h"

#include <cerrno>

#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

/// Keeps what it is given as one piece of sound.
class SoundKeeper : public AlignedAudioSink {
  public:
    void begin(std::int64_t position) override { beginning = position; }
    OptionalError samples(std::span<const float> leftPart, std::span<const float> rightPart) override {
        left.insert(left.end(), leftPart.begin(), leftPart.end());
        right.insert(right.end(), rightPart.begin(), rightPart.end());
        return failure;
    }
    OptionalError silence(std::int64_t count) override {
        silent += count;
        left.resize(left.size() + static_cast<std::size_t>(count));
        right.resize(left.size());
        return failure;
    }

    std::int64_t beginning = -1;
    std::vector<float> left;
    std::vector<float> right;
    std::int64_t silent = 0;
    OptionalError failure;
};

class AudioMixBusTest : public testing::Test {
  protected:
    void add(std::size_t track, const std::vector<float>& left, const std::vector<float>& right) {
        EXPECT_FALSE(bus.track(track).samples(left, right));
    }

    SoundKeeper keeper;
    AudioMixBus bus{2, keeper};
    using Sound = std::vector<float>;
};

TEST_F(AudioMixBusTest, TimelineBeginsAtZero) {
    EXPECT_EQ(keeper.beginning, 0);
}

TEST_F(AudioMixBusTest, TracksAreAddedUpChannelByChannel) {
    add(0, {0.25F, 0.5F}, {0.125F, 0});
    add(1, {0.25F, -0.25F}, {0, 0.5F});
    EXPECT_FALSE(bus.mixUntil(0));
    EXPECT_EQ(keeper.left, (Sound{0.5F, 0.25F}));
    EXPECT_EQ(keeper.right, (Sound{0.125F, 0.5F}));
}

TEST_F(AudioMixBusTest, SumIsLimitedToTheFullScale) {
    add(0, {0.75F, -0.75F}, {1, -1});
    add(1, {0.75F, -0.75F}, {1, -1});
    EXPECT_FALSE(bus.mixUntil(0));
    EXPECT_EQ(keeper.left, (Sound{1, -1}));
    EXPECT_EQ(keeper.right, (Sound{1, -1}));
}

TEST_F(AudioMixBusTest, WaitsForTheTrackThatIsFurthestBehind) {
    add(0, {0.5F, 0.5F, 0.5F}, {0, 0, 0});
    EXPECT_FALSE(bus.mixUntil(0));
    EXPECT_TRUE(keeper.left.empty());
    add(1, {0.25F}, {0});
    EXPECT_FALSE(bus.mixUntil(0));
    EXPECT_EQ(keeper.left, (Sound{0.75F}));
    add(1, {0.25F}, {0});
    EXPECT_FALSE(bus.mixUntil(0));
    EXPECT_EQ(keeper.left, (Sound{0.75F, 0.75F}));
}

TEST_F(AudioMixBusTest, DoesNotWaitBeyondThePosition) {
    add(0, {0.5F, 0.5F, 0.5F}, {0, 0, 0});
    EXPECT_FALSE(bus.mixUntil(2));
    EXPECT_EQ(keeper.left, (Sound{0.5F, 0.5F}));
}

TEST_F(AudioMixBusTest, SoundThatComesTooLateIsLeftOutUpToWhatIsMixed) {
    add(0, {0.5F, 0.5F, 0.5F}, {0, 0, 0});
    EXPECT_FALSE(bus.mixUntil(2));
    add(1, {0.25F, 0.25F, 0.25F}, {0, 0, 0});
    EXPECT_FALSE(bus.flush());
    EXPECT_EQ(keeper.left, (Sound{0.5F, 0.5F, 0.75F}));
}

TEST_F(AudioMixBusTest, SilenceMovesATrackOnWithoutMemory) {
    EXPECT_FALSE(bus.track(0).silence(1000000000));
    EXPECT_FALSE(bus.track(1).silence(3));
    add(1, {0.5F}, {0.5F});
    EXPECT_FALSE(bus.mixUntil(0));
    EXPECT_EQ(keeper.left, (Sound{0, 0, 0, 0.5F}));
}

TEST_F(AudioMixBusTest, TrackMayBeginLate) {
    bus.track(0).begin(2);
    add(0, {0.5F}, {0});
    add(1, {0.25F, 0.25F, 0.25F}, {0, 0, 0});
    EXPECT_FALSE(bus.mixUntil(0));
    EXPECT_EQ(keeper.left, (Sound{0.25F, 0.25F, 0.75F}));
}

TEST_F(AudioMixBusTest, FlushMixesUpToTheEndOfTheLongestTrack) {
    add(0, {0.5F}, {0});
    add(1, {0.25F, 0.25F}, {0, 0});
    EXPECT_FALSE(bus.track(1).silence(2));
    EXPECT_FALSE(bus.flush());
    EXPECT_EQ(keeper.left, (Sound{0.75F, 0.25F, 0, 0}));
    EXPECT_EQ(keeper.silent, 2);
}

TEST_F(AudioMixBusTest, FailureOfTheOutputIsPassedOn) {
    keeper.failure = KVError::posix(ENOSPC, "movie");
    add(0, {0.5F}, {0});
    EXPECT_TRUE(bus.flush());
}

}  // namespace
}  // namespace kelvo::test
