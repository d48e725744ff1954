#include "support/ChildProcess.h"
#include "support/TemporaryDirectory.h"
#include "support/media/MovieProbe.h"

#include <chrono>
#include <csignal>
#include <memory>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

/// Milliseconds of a kind, different in every run; the failing run's moments stand in the test's output.
int randomMilliseconds(int from, int to) {
    static std::mt19937 random{std::random_device{}()};
    return std::uniform_int_distribution(from, to)(random);
}

class KilledWriterTest : public ::testing::TestWithParam<int> {
  protected:
    struct Recording {
        std::string path;
        std::unique_ptr<ChildProcess> process;
        std::chrono::steady_clock::time_point begin;
    };

    std::string pathOf(int number) const { return folder.path() + "/" + std::to_string(number) + ".mp4"; }

    /// Starts recording a movie of that length.
    std::unique_ptr<ChildProcess> record(int number, const std::string& seconds) const {
        return std::make_unique<ChildProcess>(
            std::vector<std::string>{MOVIE_WRITING_PROGRAM, pathOf(number), seconds});
    }

    /// The movie plays without an error up to a second before it was cut, `seconds` after its beginning.
    void expectPlaysUntil(int number, double seconds) const {
        EXPECT_EQ(decodingComplaints(pathOf(number)), "");
        const auto times = frameTimes(pathOf(number), "v:0");
        ASSERT_FALSE(times.empty());
        EXPECT_GE(times.back(), seconds - 1.0);
    }

    static constexpr int kAtOnce = 5;
    TemporaryDirectory folder;
};

TEST_P(KilledWriterTest, MoviePlaysUpToASecondBeforeTheKill) {
    std::vector<std::thread> killers;
    std::vector<double> killTimes(kAtOnce);
    for (int i = 0; i < kAtOnce; ++i) {
        killers.emplace_back([this, i, moment = randomMilliseconds(1000, 4000), &killTimes] {
            const auto process = record(i, "30");
            ASSERT_TRUE(process->waitForLine("recording"));
            const auto begin = std::chrono::steady_clock::now();
            std::this_thread::sleep_for(std::chrono::milliseconds(moment));
            process->signal(SIGKILL);
            killTimes[static_cast<std::size_t>(i)] =
                std::chrono::duration<double>(std::chrono::steady_clock::now() - begin).count();
        });
    }
    for (std::thread& killer : killers)
        killer.join();
    for (int i = 0; i < kAtOnce; ++i) {
        SCOPED_TRACE(killTimes[static_cast<std::size_t>(i)]);
        expectPlaysUntil(i, killTimes[static_cast<std::size_t>(i)]);
    }
}

INSTANTIATE_TEST_SUITE_P(FiveTimes, KilledWriterTest, ::testing::Range(0, 2));

class KilledFinishTest : public KilledWriterTest {};

TEST_P(KilledFinishTest, MoviePlaysWhereverItsFinishingIsCut) {
    for (int i = 0; i < kAtOnce; ++i) {
        const auto process = record(i, "1.5");
        ASSERT_TRUE(process->waitForLine("finishing"));
        const int moment = randomMilliseconds(0, 12000);
        std::this_thread::sleep_for(std::chrono::microseconds(moment));
        process->signal(SIGKILL);
        SCOPED_TRACE(moment);
        expectPlaysUntil(i, 1.5);
    }
}

INSTANTIATE_TEST_SUITE_P(FiveTimes, KilledFinishTest, ::testing::Range(0, 2));

}  // namespace
}  // namespace kelvo::test
