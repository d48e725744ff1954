#include "LoginManager.h"
#include "platform/linux/notifications/LinuxNotificationCenter.h"
#include "support/LogRecorder.h"
#include "support/TemporaryDirectory.h"

#include <cstdlib>
#include <filesystem>
#include <future>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

/// What the center told about the blanked screen, state after state.
class States {
  public:
    void add(std::uint64_t state) {
        std::lock_guard lock(mutex_);
        states_.push_back(state);
        added_.notify_all();
    }
    /// Waits for the state number `index` (from 0), ten seconds at most.
    std::optional<std::uint64_t> at(std::size_t index) {
        std::unique_lock lock(mutex_);
        added_.wait_for(lock, std::chrono::seconds(10), [&] { return states_.size() > index; });
        return states_.size() > index ? std::optional(states_[index]) : std::nullopt;
    }

  private:
    std::mutex mutex_;
    std::condition_variable added_;
    std::vector<std::uint64_t> states_;
};

class BlankedScreenTest : public testing::Test {
  protected:
    void SetUp() override {
        ASSERT_TRUE(login.isRunning()) << "no bus or no login manager to test with";
        ::setenv("DBUS_SYSTEM_BUS_ADDRESS", login.busAddress().c_str(), 1);
    }

    std::unique_ptr<LinuxNotificationCenter> watch() {
        auto center = std::make_unique<LinuxNotificationCenter>(
            std::make_shared<const DeviceRoot>(folder.path(), "/none"));
        center->registerForNotification(
            kBlankedScreenNotification, QueuePriority::normal,
            [this, raw = center.get()](NotificationToken token) { states.add(raw->state(token)); });
        return center;
    }

    /// Writes the state file in one step.
    void writeStateFile(const std::string& state) const {
        folder.write("new", state);
        std::filesystem::rename(folder.path() + "/new", folder.path() + "/run/kelvod/notifications/" +
                                                            std::string(kBlankedScreenNotification));
    }

    const test::LogRecorder log;
    const test::TemporaryDirectory folder;
    const test::LoginManager login{folder.path()};
    States states;
};

TEST_F(BlankedScreenTest, FollowsTheLockOfTheSessionThatTheEnvironmentNames) {
    ::setenv("XDG_SESSION_ID", "c1", 1);
    ASSERT_TRUE(login.setLocked(true));
    const auto center = watch();
    EXPECT_EQ(states.at(0), 1U) << "a screen that is locked already counts";
    ASSERT_TRUE(login.setLocked(false));
    EXPECT_EQ(states.at(1), 0U);
    ASSERT_TRUE(login.setLocked(true));
    EXPECT_EQ(states.at(2), 1U);
}

TEST_F(BlankedScreenTest, FollowsTheFirstSeatsSessionWhenTheProcessHasNone) {
    ::unsetenv("XDG_SESSION_ID");
    ASSERT_TRUE(login.setLocked(true));
    const auto center = watch();
    EXPECT_EQ(states.at(0), 1U);
}

TEST_F(BlankedScreenTest, StateFileTakesOverWhenTheBusDies) {
    ::setenv("XDG_SESSION_ID", "c1", 1);
    ASSERT_TRUE(login.setLocked(true));
    const auto center = watch();
    ASSERT_EQ(states.at(0), 1U);
    writeStateFile("5");
    login.killBus();
    while (!log.contains("lost the system bus; the screen's lock state is read from its state file now")) {
        std::this_thread::yield();
    }
    writeStateFile("7");
    EXPECT_EQ(states.at(1), 7U) << "what the file said while the login manager knew better does not count";
}

}  // namespace
}  // namespace kelvo
