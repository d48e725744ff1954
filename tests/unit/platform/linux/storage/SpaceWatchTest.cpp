#include "platform/linux/storage/SpaceWatch.h"

#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using namespace std::chrono_literals;
using testing::ElementsAre;
using testing::IsEmpty;

class SpaceWatchTest : public testing::Test {
  protected:
    /// The calls that one look leads to.
    std::vector<std::string> look(std::uint64_t freeBytes, std::chrono::nanoseconds now) {
        calls_.clear();
        watch_.look(freeBytes, now);
        return calls_;
    }

    static constexpr std::uint64_t kPlenty = 5000000000;

  private:
    StoragePurgeCallbacks record() {
        StoragePurgeCallbacks callbacks;
        callbacks.purgeableSpace = [this](PurgeUrgency urgency) {
            calls_.push_back("purgeable " + std::to_string(urgency));
            return 10;
        };
        callbacks.purge = [this](PurgeUrgency urgency) {
            calls_.push_back("purge " + std::to_string(urgency));
            return 77U;
        };
        callbacks.cancel = [this](std::uint64_t argument) {
            calls_.push_back("cancel " + std::to_string(argument));
            return argument;
        };
        callbacks.periodic = [this] {
            calls_.push_back("periodic");
            return 0U;
        };
        return callbacks;
    }

    std::vector<std::string> calls_;
    SpaceWatch watch_{record(), 0s};
};

TEST_F(SpaceWatchTest, BoundsSeparateTheUrgencies) {
    EXPECT_EQ(SpaceWatch::urgencyFor(1000000000), 0);
    EXPECT_EQ(SpaceWatch::urgencyFor(999999999), 1);
    EXPECT_EQ(SpaceWatch::urgencyFor(300000000), 1);
    EXPECT_EQ(SpaceWatch::urgencyFor(299999999), 2);
    EXPECT_EQ(SpaceWatch::urgencyFor(64000000), 2);
    EXPECT_EQ(SpaceWatch::urgencyFor(63999999), 3);
    EXPECT_EQ(SpaceWatch::urgencyFor(0), 3);
}

TEST_F(SpaceWatchTest, PlentyOfSpaceAsksForNothing) {
    EXPECT_THAT(look(kPlenty, 10s), IsEmpty());
}

TEST_F(SpaceWatchTest, EachFallUnderABoundPurgesAtItsUrgency) {
    EXPECT_THAT(look(900000000, 10s), ElementsAre("purgeable 1", "purge 1"));
    EXPECT_THAT(look(200000000, 20s), ElementsAre("purgeable 2", "purge 2"));
    EXPECT_THAT(look(1000, 30s), ElementsAre("purgeable 3", "purge 3"));
}

TEST_F(SpaceWatchTest, SameUrgencyIsRepeatedOnlyAfterFiveMinutes) {
    look(900000000, 10s);
    EXPECT_THAT(look(900000000, 20s), IsEmpty());
    EXPECT_THAT(look(900000000, 310s), ElementsAre("purgeable 1", "purge 1"));
}

TEST_F(SpaceWatchTest, RiseToALowerUrgencyPurgesNothingAtOnce) {
    look(1000, 10s);
    EXPECT_THAT(look(900000000, 20s), IsEmpty());
}

TEST_F(SpaceWatchTest, RoomAgainCancelsThePurgeWithWhatItFreed) {
    look(900000000, 10s);
    EXPECT_THAT(look(kPlenty, 20s), ElementsAre("cancel 77"));
    EXPECT_THAT(look(kPlenty, 30s), IsEmpty());
}

TEST_F(SpaceWatchTest, PeriodicCallbackRunsOnceAnHour) {
    EXPECT_THAT(look(kPlenty, 59min), IsEmpty());
    EXPECT_THAT(look(kPlenty, 60min), ElementsAre("periodic"));
    EXPECT_THAT(look(kPlenty, 61min), IsEmpty());
    EXPECT_THAT(look(kPlenty, 120min), ElementsAre("periodic"));
}

}  // namespace
}  // namespace kelvo
