#include "platform/linux/system/DescriptorLimit.h"
#include "platform/linux/system/InstanceLock.h"
#include "platform/linux/system/KernelRandom.h"
#include "platform/linux/system/Resources.h"
#include "platform/linux/system/SystemClock.h"
#include "platform/linux/system/TerminationSignals.h"
#include "support/TemporaryDirectory.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <ctime>
#include <filesystem>
#include <future>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

TEST(SystemClockTest, IsTheHostsClock) {
    const SystemClock clock;
    EXPECT_NEAR(clock.now().secondsSince1970(), static_cast<double>(std::time(nullptr)), 2);
    const auto first = clock.monotonicNow();
    EXPECT_GT(first.count(), 0);
    EXPECT_GE(clock.monotonicNow(), first);
}

TEST(KernelRandomTest, FillsEveryByte) {
    KernelRandom random;
    std::array<std::byte, 64> bytes{};
    for (int i = 0; i < 100; ++i) {
        std::array<std::byte, 64> more{};
        random.fill(more);
        for (std::size_t k = 0; k < bytes.size(); ++k)
            bytes[k] |= more[k];
    }
    EXPECT_TRUE(std::ranges::all_of(bytes, [](std::byte byte) { return byte == std::byte{0xFF}; }));
}

TEST(InstanceLockTest, SecondHolderIsRefusedUntilTheFirstIsGone) {
    const test::TemporaryDirectory folder;
    const std::string path = folder.path() + "/run/kelvod/lock";
    {
        const auto first = InstanceLock::acquire(path);
        ASSERT_TRUE(first);
        const auto second = InstanceLock::acquire(path);
        ASSERT_FALSE(second);
        EXPECT_EQ(second.error().code(), EWOULDBLOCK);
    }
    EXPECT_TRUE(InstanceLock::acquire(path));
}

TEST(InstanceLockTest, FolderThatCannotBeMadeIsAnError) {
    EXPECT_FALSE(InstanceLock::acquire("/dev/null/lock"));
}

TEST(InstanceLockTest, LinkInThePlaceOfTheLockIsNotFollowed) {
    const test::TemporaryDirectory folder;
    const std::string path = folder.path() + "/lock";
    ASSERT_EQ(::symlink((folder.path() + "/target").c_str(), path.c_str()), 0);
    EXPECT_FALSE(InstanceLock::acquire(path));
    EXPECT_FALSE(std::filesystem::exists(folder.path() + "/target"));
}

TEST(ResourcesTest, BuildTreeKeepsThemBesideTheProgram) {
    EXPECT_TRUE(std::filesystem::exists(installedResourceFolder() + "/KelvoKit.framework/Info.json"));
}

/// Runs `body` in a process of its own, as signal masks and handlers are the process's.
template <typename Body>
int exitStatusOf(Body body) {
    const pid_t child = ::fork();
    if (child == 0) ::_exit(body());
    int status = 0;
    ::waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

class TerminationSignalsTest : public testing::TestWithParam<int> {};

TEST_P(TerminationSignalsTest, SignalRunsTheHandler) {
    EXPECT_EQ(exitStatusOf([] {
                  TerminationSignals signals;
                  std::promise<int> handled;
                  signals.watch([&] { handled.set_value(7); });
                  ::kill(::getpid(), GetParam());
                  return handled.get_future().get();
              }),
              7);
}

INSTANTIATE_TEST_SUITE_P(Signals, TerminationSignalsTest, testing::Values(SIGTERM, SIGINT, SIGHUP));

TEST(NoTerminationSignalTest, HangUpThatIsIgnoredStaysSo) {
    EXPECT_EQ(exitStatusOf([] {
                  std::signal(SIGHUP, SIG_IGN);  // as nohup does
                  const TerminationSignals signals;
                  ::kill(::getpid(), SIGHUP);
                  sigset_t waiting;
                  ::sigpending(&waiting);
                  return sigismember(&waiting, SIGHUP);
              }),
              0);
}

TEST(NoTerminationSignalTest, WithoutASignalTheHandlerNeverRuns) {
    EXPECT_EQ(exitStatusOf([] {
                  TerminationSignals signals;
                  signals.watch([] { ::_exit(1); });
                  return 0;
              }),
              0);
}

TEST(DescriptorLimitTest, IsRaisedAsFarAsItMayBe) {
    EXPECT_EQ(exitStatusOf([] {
                  const rlimit low{200, 500};
                  ::setrlimit(RLIMIT_NOFILE, &low);
                  raiseDescriptorLimit();
                  rlimit raised{};
                  ::getrlimit(RLIMIT_NOFILE, &raised);
                  return raised.rlim_cur == 500 && raised.rlim_max == 500 ? 0 : 1;
              }),
              0);
}

}  // namespace
}  // namespace kelvo
