#include "platform/linux/settings/InCarDisplayFile.h"
#include "support/TemporaryDirectory.h"

#include <cerrno>
#include <filesystem>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

class InCarDisplayFileTest : public testing::Test {
  protected:
    void write(const std::string& content) const { device.write("run/kelvod/in-car-display", content); }

    const test::TemporaryDirectory device;
    InCarDisplayFile display{std::make_shared<const DeviceRoot>(device.path(), "/none")};
};

TEST_F(InCarDisplayFileTest, WithoutAFileThereIsNoCar) {
    const auto isActive = display.isActive();
    ASSERT_TRUE(isActive);
    EXPECT_FALSE(*isActive);
}

TEST_F(InCarDisplayFileTest, FileIsReadAtEachQuery) {
    for (const auto& [content, isActive] :
         {std::pair("1", true), std::pair("0\n", false), std::pair("2\n", true)}) {
        write(content);
        EXPECT_EQ(display.isActive().valueOr(!isActive), isActive) << content;
    }
}

TEST_F(InCarDisplayFileTest, FileThatTellsNothingIsAnError) {
    for (const char* const content : {"", "yes", "-1", "99999999999999999999999"}) {
        write(content);
        EXPECT_EQ(display.isActive().optionalError().value_or(KVError("", 0)).code(), EINVAL) << content;
    }
    std::filesystem::remove(device.path() + "/run/kelvod/in-car-display");
    std::filesystem::create_directories(device.path() + "/run/kelvod/in-car-display");
    EXPECT_TRUE(display.isActive().optionalError());
}

}  // namespace
}  // namespace kelvo
