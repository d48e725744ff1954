#include "platform/linux/files/LinuxFileSystem.h"
#include "support/TemporaryDirectory.h"

#include <filesystem>
#include <sys/statvfs.h>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

/// What only the real file system has: links, volumes and a host below it.
class LinuxFileSystemTest : public testing::Test {
  protected:
    const test::TemporaryDirectory device;
    LinuxFileSystem files{std::make_shared<const DeviceRoot>(device.path(), "/none")};
};

TEST_F(LinuxFileSystemTest, LinkThatLeadsNowhereExists) {
    ASSERT_EQ(::symlink("/nowhere", (device.path() + "/link").c_str()), 0);
    EXPECT_TRUE(files.itemExists("/link"));
}

TEST_F(LinuxFileSystemTest, RemovingALinkLeavesItsTarget) {
    const std::string target = device.write("folder/file", "x");
    ASSERT_EQ(::symlink((device.path() + "/folder").c_str(), (device.path() + "/link").c_str()), 0);
    EXPECT_FALSE(files.removeItem("/link"));
    EXPECT_TRUE(std::filesystem::exists(target));
    EXPECT_FALSE(files.itemExists("/link"));
}

TEST_F(LinuxFileSystemTest, MovesToAnotherVolume) {
    const std::string elsewhere = "/dev/shm/kelvo-move-" + std::to_string(::getpid());
    device.write("a.mp4", "movie");
    EXPECT_FALSE(files.moveItem("/a.mp4", "/@host" + elsewhere));
    EXPECT_FALSE(files.itemExists("/a.mp4"));
    EXPECT_EQ(std::filesystem::file_size(elsewhere), 5U);
    std::filesystem::remove(elsewhere);
}

TEST_F(LinuxFileSystemTest, FreeSpaceIsWhatAnUnprivilegedProcessMayUse) {
    struct statvfs status {};
    ASSERT_EQ(::statvfs(device.path().c_str(), &status), 0);
    const auto free = files.freeSpace("/");
    ASSERT_TRUE(free);
    constexpr std::uint64_t kOthersMeanwhile = 1U << 30;  // tests and builds beside this one write, too
    const std::uint64_t expected = static_cast<std::uint64_t>(status.f_bavail) * status.f_frsize;
    EXPECT_NEAR(static_cast<double>(*free), static_cast<double>(expected), kOthersMeanwhile);
}

TEST_F(LinuxFileSystemTest, HostPathIsUnderTheRoot) {
    EXPECT_EQ(files.hostPath("/a//b"), device.path() + "/a/b");
}

}  // namespace
}  // namespace kelvo
