#include "platform/linux/notifications/LinuxNotificationCenter.h"
#include "platform/linux/notifications/StateFiles.h"
#include "support/TemporaryDirectory.h"

#include <filesystem>
#include <future>
#include <mutex>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class StateFilesTest : public testing::Test {
  protected:
    const test::TemporaryDirectory folder;
    StateFiles files{folder.path() + "/states"};
};

TEST_F(StateFilesTest, WrittenFileIsAChange) {
    folder.write("states/lock", "1\n");
    EXPECT_THAT(files.takeChangedNames(), ElementsAre("lock"));
    EXPECT_EQ(files.state("lock"), 1U);
    EXPECT_THAT(files.takeChangedNames(), IsEmpty());
}

TEST_F(StateFilesTest, FileThatIsMovedIntoPlaceIsAChange) {
    folder.write("new", "18446744073709551615");
    std::filesystem::rename(folder.path() + "/new", folder.path() + "/states/lock");
    EXPECT_THAT(files.takeChangedNames(), ElementsAre("lock"));
    EXPECT_EQ(files.state("lock"), 18446744073709551615U);
}

TEST_F(StateFilesTest, RemovedFileIsAChangeToZero) {
    const std::string path = folder.write("states/lock", "1");
    files.takeChangedNames();
    std::filesystem::remove(path);
    EXPECT_THAT(files.takeChangedNames(), ElementsAre("lock"));
    EXPECT_EQ(files.state("lock"), 0U);
}

TEST_F(StateFilesTest, ContentThatIsNoNumberIsZero) {
    folder.write("states/lock", "locked");
    EXPECT_EQ(files.state("lock"), 0U);
    folder.write("states/lock", std::string(100, '1'));
    EXPECT_EQ(files.state("lock"), 0U);
}

TEST_F(StateFilesTest, ManyChangesOfOneFileAreOne) {
    for (int i = 0; i < 1000; ++i)
        folder.write("states/lock", "1");
    EXPECT_THAT(files.takeChangedNames(), ElementsAre("lock"));
}

TEST(UnwatchableStateFilesTest, FolderThatCannotBeMadeNeverChanges) {
    StateFiles files("/dev/null/states");
    EXPECT_EQ(files.descriptor(), -1);
    EXPECT_THAT(files.takeChangedNames(), IsEmpty());
    EXPECT_THAT(files.names(), IsEmpty());
}

/// The center without a system bus, which a test machine has not.
class LinuxNotificationCenterTest : public testing::Test {
  protected:
    static void SetUpTestSuite() { ::setenv("DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nonexistent/bus", 1); }

    void post(const std::string& name, const std::string& state) const {
        device.write("run/kelvod/notifications/" + name, state);
    }

    const test::TemporaryDirectory device;
    const std::shared_ptr<const DeviceRoot> root = std::make_shared<const DeviceRoot>(device.path(), "/none");
};

TEST_F(LinuxNotificationCenterTest, StateThatWasThereBeforeFiresOnce) {
    post("lock", "3");
    LinuxNotificationCenter center(root);
    std::promise<NotificationToken> fired;
    const auto token = center.registerForNotification(
        "lock", QueuePriority::normal, [&](NotificationToken which) { fired.set_value(which); });
    EXPECT_EQ(fired.get_future().get(), token);
    EXPECT_EQ(center.state(token), 3U);
}

TEST_F(LinuxNotificationCenterTest, WrittenStateFiresWithItsToken) {
    post("ready", "1");
    LinuxNotificationCenter center(root);
    std::promise<void> watching;
    std::promise<NotificationToken> fired;
    center.registerForNotification("ready", QueuePriority::normal,
                                   [&](NotificationToken) { watching.set_value(); });
    const auto token =
        center.registerForNotification(std::string(kBlankedScreenNotification), QueuePriority::normal,
                                       [&](NotificationToken which) { fired.set_value(which); });
    watching.get_future().get();
    // Into place in one step: a state that is written piece by piece would fire for each piece.
    device.write("new", "1");
    std::filesystem::rename(device.path() + "/new", device.path() + "/run/kelvod/notifications/" +
                                                        std::string(kBlankedScreenNotification));
    EXPECT_EQ(fired.get_future().get(), token);
    EXPECT_EQ(center.state(token), 1U);
}

TEST_F(LinuxNotificationCenterTest, RemovedObserverIsNotTold) {
    post("ready", "1");
    LinuxNotificationCenter center(root);
    std::promise<void> told;
    std::once_flag once;  // the file may count as there before and as written now
    center.registerForNotification("ready", QueuePriority::normal, [](NotificationToken) { FAIL(); });
    center.removeObservers("ready");
    const auto token = center.registerForNotification("other", QueuePriority::normal, [&](NotificationToken) {
        std::call_once(once, [&] { told.set_value(); });
    });
    post("other", "1");
    told.get_future().get();
    GlobalQueue::drain();
    EXPECT_EQ(center.state(token), 1U);
}

TEST_F(LinuxNotificationCenterTest, UnknownTokenAndNameAreNoError) {
    LinuxNotificationCenter center(root);
    EXPECT_EQ(center.state(99), 0U);
    center.removeObservers("nobody");
}

}  // namespace
}  // namespace kelvo
