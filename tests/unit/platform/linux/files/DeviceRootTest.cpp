#include "platform/linux/files/DeviceRoot.h"
#include "support/TemporaryDirectory.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

TEST(DeviceRootTest, PathLiesUnderTheRoot) {
    EXPECT_EQ(DeviceRoot("/srv/phone/", "/r").hostPath("/etc/x"), "/srv/phone/etc/x");
}

TEST(DeviceRootTest, SlashAsRootLeavesPathsAlone) {
    const DeviceRoot root("/", "/r");
    EXPECT_EQ(root.hostPath("/etc/x"), "/etc/x");
    EXPECT_EQ(root.devicePath("/etc/x"), "/etc/x");
}

TEST(DeviceRootTest, DoubledSlashIsOneOnTheHost) {
    EXPECT_EQ(DeviceRoot("/d", "/r").hostPath("/private//a.mp4"), "/d/private/a.mp4");
}

TEST(DeviceRootTest, DotsCannotLeaveTheRoot) {
    const DeviceRoot root("/d", "/r");
    EXPECT_EQ(root.hostPath("/../../etc/shadow"), "/d/etc/shadow");
    EXPECT_EQ(root.hostPath("../x"), "/d/x");
}

TEST(DeviceRootTest, HostPathInsideTheRootLosesIt) {
    EXPECT_EQ(DeviceRoot("/d", "/r").devicePath("/d/Applications/A.app"), "/Applications/A.app");
}

TEST(DeviceRootTest, HostPathOutsideTheRootComesBackToItself) {
    const DeviceRoot root("/d", "/r");
    EXPECT_EQ(root.devicePath("/usr/bin/x"), "/@host/usr/bin/x");
    EXPECT_EQ(root.hostPath("/@host/usr/bin/x"), "/usr/bin/x");
    EXPECT_EQ(root.devicePath("/data/x"), "/@host/data/x") << "a root is a folder, not a prefix";
}

TEST(DeviceRootTest, SystemResourceOfTheRootComesFirst) {
    const test::TemporaryDirectory device;
    const test::TemporaryDirectory resources;
    const std::string own = device.write("System/Library/Frameworks/KelvoKit.framework/Info.json", "{}");
    resources.write("KelvoKit.framework/Info.json", "{}");
    const DeviceRoot root(device.path(), resources.path());
    EXPECT_EQ(root.hostPathForReading("/System/Library/Frameworks/KelvoKit.framework/Info.json"), own);
}

TEST(DeviceRootTest, MissingSystemResourceIsFoundAmongTheInstalledOnes) {
    const test::TemporaryDirectory device;
    const DeviceRoot root(device.path(), "/usr/share/kelvod");
    EXPECT_EQ(root.hostPathForReading("/System/Library/Frameworks/KelvoKit.framework/de.lproj"),
              "/usr/share/kelvod/KelvoKit.framework/de.lproj");
    EXPECT_EQ(root.hostPathForReading("/System/Library/QuickPanel/Bundles/KelvoKitModule.bundle"),
              "/usr/share/kelvod/KelvoKitModule.bundle");
}

TEST(DeviceRootTest, OtherMissingPathsAreNotLookedForAmongTheResources) {
    const test::TemporaryDirectory device;
    const DeviceRoot root(device.path(), "/usr/share/kelvod");
    EXPECT_EQ(root.hostPathForReading("/private/KelvoKit.framework"),
              device.path() + "/private/KelvoKit.framework");
    EXPECT_EQ(root.hostPathForReading("/System/Library/x"), device.path() + "/System/Library/x");
}

}  // namespace
}  // namespace kelvo
