#include "support/ChildProcess.h"
#include "support/TemporaryDirectory.h"

#include <fstream>
#include <sstream>
#include <string>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

TEST(DescriptorLimitTest, DaemonMayOpenAsManyFilesAsTheSystemAllows) {
    const test::TemporaryDirectory root;
    test::ChildProcess daemon{{KELVOD_PROGRAM, "--root", root.path(), "--log", "stderr"},
                              {{"DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nonexistent"}}};
    ASSERT_TRUE(daemon.waitForLine("_srSetupTempDirectory")) << daemon.output();
    std::ifstream limits("/proc/" + std::to_string(daemon.processIdentifier()) + "/limits");
    std::string line;
    while (std::getline(limits, line) && !line.starts_with("Max open files")) {
    }
    std::istringstream words(line.substr(std::string("Max open files").size()));
    std::string soft;
    std::string hard;
    words >> soft >> hard;
    EXPECT_EQ(soft, hard);
    EXPECT_FALSE(soft.empty());
}

}  // namespace
}  // namespace kelvo
