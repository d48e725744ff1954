#include "platform/linux/settings/DeviceFile.h"
#include "support/LogRecorder.h"
#include "support/TemporaryDirectory.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

class DeviceFileTest : public testing::Test {
  protected:
    DeviceFile read() const { return DeviceFile(DeviceRoot(device.path(), "/none")); }
    DeviceFile read(const std::string& content) const {
        device.write("etc/kelvod/device.json", content);
        return read();
    }

    const test::TemporaryDirectory device;
    const test::LogRecorder log;
};

TEST_F(DeviceFileTest, WithoutAFileTheDeviceIsADesktop) {
    DeviceFile file = read();
    EXPECT_EQ(file.idiom(), DeviceIdiom::desktop);
    EXPECT_FALSE(file.isInternalBuild());
    EXPECT_EQ(file.chipIdentifier(), 0);
    EXPECT_EQ(file.mainScreenOrientation(), std::nullopt);
    EXPECT_EQ(file.regionalBehaviorShutterClick(), std::nullopt);
    EXPECT_TRUE(log.lines().empty());
}

TEST_F(DeviceFileTest, ScreenThatTheFileDoesNotTellOfIsAskedUntilItAnswers) {
    std::optional<float> answer;
    int questions = 0;
    DeviceFile file(DeviceRoot(device.path(), "/none"), [&] {
        ++questions;
        return answer;
    });
    EXPECT_EQ(file.mainScreenOrientation(), std::nullopt);
    answer = 90.0F;
    EXPECT_EQ(file.mainScreenOrientation(), 90.0F);
    EXPECT_EQ(file.mainScreenOrientation(), 90.0F);
    EXPECT_EQ(questions, 2);
}

TEST_F(DeviceFileTest, ScreenThatTheFileTellsOfIsNotAsked) {
    device.write("etc/kelvod/device.json", R"({"mainScreenOrientation":0})");
    DeviceFile file(DeviceRoot(device.path(), "/none"), []() -> std::optional<float> {
        ADD_FAILURE();
        return 90.0F;
    });
    EXPECT_EQ(file.mainScreenOrientation(), 0.0F);
}

TEST_F(DeviceFileTest, EveryPropertyIsRead) {
    DeviceFile file =
        read(R"({"idiom":"tablet","internalBuild":true,"chipIdentifier":35168,"mainScreenOrientation":1.5})");
    EXPECT_EQ(file.idiom(), DeviceIdiom::tablet);
    EXPECT_TRUE(file.isInternalBuild());
    EXPECT_EQ(file.chipIdentifier(), 35168);
    EXPECT_EQ(file.mainScreenOrientation(), 1.5F);
    EXPECT_EQ(read(R"({"idiom":"phone"})").idiom(), DeviceIdiom::phone);
    EXPECT_EQ(read(R"({"regionalBehaviorShutterClick":true})").regionalBehaviorShutterClick(), true);
}

TEST_F(DeviceFileTest, WrongPropertyIsLoggedAndKeepsItsDefault) {
    DeviceFile file = read(R"({"idiom":"toaster","chipIdentifier":"x","internalBuild":true})");
    EXPECT_EQ(file.idiom(), DeviceIdiom::desktop);
    EXPECT_EQ(file.chipIdentifier(), 0);
    EXPECT_TRUE(file.isInternalBuild());
    EXPECT_EQ(log.count(LogLevel::error, "device file: idiom is wrong: \"toaster\""), 1U);
    EXPECT_EQ(log.count(LogLevel::error, "device file: chipIdentifier is wrong: \"x\""), 1U);
}

TEST_F(DeviceFileTest, MalformedFileIsLoggedAndEveryDefaultHolds) {
    EXPECT_EQ(read("{").idiom(), DeviceIdiom::desktop);
    EXPECT_EQ(log.lines().size(), 1U);
}

}  // namespace
}  // namespace kelvo
