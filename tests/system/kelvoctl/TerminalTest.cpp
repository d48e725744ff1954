#include "ScriptedDaemon.h"
#include "base/UniqueFd.h"

#include <array>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <poll.h>
#include <regex>
#include <unistd.h>

namespace kelvo {
namespace {

using test::eventually;
using test::KelvoctlProcess;

/// A terminal that nobody looks at but the test.
class Terminal {
  public:
    Terminal() : master_(::posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC)) {
        std::array<char, 64> name{};
        if (::grantpt(master_.get()) != 0 || ::unlockpt(master_.get()) != 0 ||
            ::ptsname_r(master_.get(), name.data(), name.size()) != 0)
            return;
        path_ = name.data();
        // Held, so that reading does not fail before the program has opened it.
        slave_ = UniqueFd(::open(name.data(), O_RDWR | O_NOCTTY | O_CLOEXEC));
    }
    /// How programs open it; empty when there is none.
    const std::string& path() const { return path_; }
    /// All that was shown so far.
    const std::string& shown() {
        pollfd source{master_.get(), POLLIN, 0};
        while (::poll(&source, 1, 0) > 0) {
            std::array<char, 4096> buffer;
            const ssize_t count = ::read(master_.get(), buffer.data(), buffer.size());
            if (count <= 0) break;
            shown_.append(buffer.data(), static_cast<std::size_t>(count));
        }
        return shown_;
    }

  private:
    UniqueFd master_;
    UniqueFd slave_;
    std::string path_;
    std::string shown_;
};

class TerminalTest : public test::KelvoctlRecordingTest {
  protected:
    void SetUp() override { ASSERT_NE(terminal.path(), ""); }

    /// kelvoctl with both outputs on the terminal.
    std::unique_ptr<test::ChildProcess> run(const std::vector<std::string>& arguments) {
        std::vector<std::string> command{"sh", "-c", "exec \"$0\" \"$@\" >\"$TERMINAL\" 2>&1",
                                         KELVOCTL_PROGRAM};
        command.insert(command.end(), arguments.begin(), arguments.end());
        return std::make_unique<test::ChildProcess>(
            command, std::map<std::string, std::string>{
                         {"KELVO_SOCKET", socket}, {"DISPLAY", ""}, {"TERMINAL", terminal.path()}});
    }
    bool shows(const std::string& text) {
        return eventually([&] { return terminal.shown().find(text) != std::string::npos; });
    }

    Terminal terminal;
};

TEST_F(TerminalTest, RunningTimeIsRedrawnOnOneLineAndTakenAwayAtTheEnd) {
    const auto record = run({"record"});
    const auto isRedrawn = [&] { return std::regex_search(terminal.shown(), std::regex(" 0:[0-9][1-9] ")); };
    ASSERT_TRUE(eventually(isRedrawn)) << terminal.shown();
    record->signal(SIGINT);
    EXPECT_EQ(record->waitForExit(), 0);
    ASSERT_TRUE(shows(" s to the library\r\n")) << terminal.shown();
    // The line is written again and again over itself, and at last there is nothing of it.
    const std::regex expected(
        "recording; Ctrl-C stops and saves\r\n"
        "(\r\x1b\\[31m●\x1b\\[0m 0:[0-9]{2} )+"
        "\r\x1b\\[K"
        "saving; this takes a while after a long recording\r\n"
        "saved [0-9.]+ s to the library\r\n");
    EXPECT_TRUE(std::regex_match(terminal.shown(), expected)) << terminal.shown();
    EXPECT_NE(terminal.shown().find(" 0:00 "), std::string::npos) << "it begins when the recording does";
}

TEST_F(TerminalTest, ObjectsAreNotMixedWithARunningTime) {
    const auto record = run({"record", "--json", "--seconds=0.6"});
    EXPECT_EQ(record->waitForExit(), 0);
    ASSERT_TRUE(shows("\"recording\":true")) << terminal.shown();
    EXPECT_EQ(terminal.shown().find('\x1b'), std::string::npos) << terminal.shown();
}

TEST_F(TerminalTest, NothingIsRedrawnInAPipe) {
    const auto [status, output] = KelvoctlProcess::run(socket, {"record", "--seconds=0.6"});
    EXPECT_EQ(status, 0);
    EXPECT_NE(output.find("recording; Ctrl-C stops and saves\n"), std::string::npos);
    EXPECT_EQ(output.find_first_of("\r\x1b"), std::string::npos) << output;
}

}  // namespace
}  // namespace kelvo
