#include "platform/linux/bundles/LinuxBundleService.h"
#include "platform/linux/bundles/LocaleLanguages.h"
#include "support/TemporaryDirectory.h"

#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

namespace fs = std::filesystem;

/// A process that runs the program at `path` until it is killed.
class Program {
  public:
    explicit Program(const std::string& path) {
        int gate[2];
        if (::pipe2(gate, O_CLOEXEC) != 0) return;
        processIdentifier_ = ::fork();
        if (processIdentifier_ == 0) {
            ::execl(path.c_str(), "sleep", "1000", nullptr);
            ::_exit(127);
        }
        ::close(gate[1]);
        char byte = 0;
        // The pipe closes when the program has replaced us.
        while (::read(gate[0], &byte, 1) > 0) {
        }
        ::close(gate[0]);
    }
    ~Program() {
        ::kill(processIdentifier_, SIGKILL);
        ::waitpid(processIdentifier_, nullptr, 0);
    }
    Program(const Program&) = delete;
    Program& operator=(const Program&) = delete;
    int processIdentifier() const { return processIdentifier_; }

  private:
    int processIdentifier_ = -1;
};

class ProcessLookupTest : public testing::Test {
  protected:
    std::string addApplication() const {
        device.write("Applications/A.app/Info.json", R"({"identifier":"a","executable":"bin/sleep"})");
        const std::string program = device.path() + "/Applications/A.app/bin/sleep";
        fs::create_directories(fs::path(program).parent_path());
        fs::copy_file("/bin/sleep", program);
        return program;
    }

    const test::TemporaryDirectory device;
    LinuxBundleService service{std::make_shared<const DeviceRoot>(device.path(), "/none"),
                               std::make_shared<LocaleLanguages>("en", "")};
};

TEST_F(ProcessLookupTest, OwnExecutableIsFound) {
    EXPECT_EQ(service.executablePath(::getpid()), fs::read_symlink("/proc/self/exe").string());
}

TEST_F(ProcessLookupTest, MissingProcessHasNoExecutable) {
    EXPECT_EQ(service.executablePath(-1), std::nullopt);
    EXPECT_EQ(service.executablePath(0), std::nullopt);
}

TEST_F(ProcessLookupTest, ProcessBelongsToTheBundleThatHoldsItsProgram) {
    const std::string path = addApplication();
    const Program program(path);
    EXPECT_EQ(service.executablePath(program.processIdentifier()), path);
    const auto folder = service.folderOfBundleOwning(path);
    EXPECT_EQ(folder, "/Applications/A.app");
    EXPECT_EQ(service.bundleAtPath(*folder)->bundleIdentifier(), "a");
}

TEST_F(ProcessLookupTest, DeletedProgramIsNobodys) {
    const std::string path = addApplication();
    const Program program(path);
    fs::remove(path);
    EXPECT_EQ(service.executablePath(program.processIdentifier()), std::nullopt);
}

TEST_F(ProcessLookupTest, ReplacedProgramIsNobodys) {
    const std::string path = addApplication();
    const Program program(path);
    fs::remove(path);
    fs::copy_file("/bin/sleep", path);
    EXPECT_EQ(service.executablePath(program.processIdentifier()), std::nullopt);
}

TEST_F(ProcessLookupTest, ProgramOutsideEveryBundleHasNoFolder) {
    EXPECT_EQ(service.folderOfBundleOwning("/usr/bin/true"), std::nullopt);
    EXPECT_EQ(service.folderOfBundleOwning("relative"), std::nullopt);
}

TEST_F(ProcessLookupTest, BundleOutsideTheRootCanStillBeOpened) {
    const test::TemporaryDirectory elsewhere;
    elsewhere.write("B.app/Info.json", R"({"identifier":"b"})");
    const auto folder = service.folderOfBundleOwning(elsewhere.path() + "/B.app/b");
    ASSERT_TRUE(folder);
    EXPECT_EQ(service.bundleAtPath(*folder)->bundleIdentifier(), "b");
}

}  // namespace
}  // namespace kelvo
