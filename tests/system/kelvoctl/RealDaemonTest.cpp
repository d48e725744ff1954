#include "KelvoctlProcess.h"
#include "support/Eventually.h"
#include "support/TemporaryDirectory.h"

#include <csignal>
#include <filesystem>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using test::KelvoctlProcess;
using Answer = std::pair<int, std::string>;

TEST(KelvoctlTest, WrongArgumentsAreOneLineAndStatus2) {
    EXPECT_EQ(KelvoctlProcess::run("", {"frob"}), Answer(2, "kelvoctl: unknown command frob\n"));
    EXPECT_EQ(KelvoctlProcess::run("", {"record", "--seconds", "soon"}),
              Answer(2, "kelvoctl: --seconds needs a number above 0 and at most a week's, not soon\n"));
}

TEST(KelvoctlTest, HelpIsPrintedWithoutADaemon) {
    const auto [status, text] = KelvoctlProcess::run("/nonexistent", {"record", "--help"});
    EXPECT_EQ(status, 0);
    EXPECT_TRUE(text.starts_with("Usage: kelvoctl record")) << text;
}

TEST(KelvoctlTest, AbsentDaemonIsStatus3AndTellsWhatToStart) {
    const auto [status, text] = KelvoctlProcess::run("/nonexistent/socket", {"status"});
    EXPECT_EQ(status, 3);
    EXPECT_TRUE(
        text.starts_with("kelvoctl: no daemon answers: /nonexistent/socket: No such file or directory\n"))
        << text;
    EXPECT_NE(text.find("kelvod --root DIR"), std::string::npos);
}

TEST(KelvoctlTest, AbsentDaemonIsAnErrorInJson) {
    EXPECT_TRUE(KelvoctlProcess::answer("/nonexistent/socket", {"status", "--json"})
                    .starts_with(R"({"error":{"description":"no daemon answers: )"));
}

/// kelvoctl before the real daemon, which takes it for the system shell.
class KelvoctlWithDaemonTest : public testing::Test {
  protected:
    KelvoctlWithDaemonTest() {
        EXPECT_TRUE(test::eventually([this] { return std::filesystem::exists(socket); })) << daemon.output();
    }

    const test::TemporaryDirectory root;
    const std::string socket = root.path() + "/run/kelvod/com.quillon.kelvod";
    test::ChildProcess daemon{{KELVOD_PROGRAM, "--root", root.path(), "--log", "stderr"},
                              {{"DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nonexistent"}, {"DISPLAY", ""}}};
};

TEST_F(KelvoctlWithDaemonTest, StatusTellsThatNothingIsRecorded) {
    EXPECT_EQ(KelvoctlProcess::run(socket, {"status"}), Answer(0, "nothing is being recorded\n"));
}

TEST_F(KelvoctlWithDaemonTest, StatusInJsonHasTheDaemonsKeys) {
    EXPECT_EQ(KelvoctlProcess::answer(socket, {"status", "--json"}),
              "{\"isRecording\":false,\"isBroadcasting\":false,\"microphoneEnabled\":false,"
              "\"isSystemRecording\":false,"
              "\"hasUserConsentForMicrophone\":false,\"hasUserConsentForCamera\":false,"
              "\"microphoneEnabledPersistent\":false}\n");
}

TEST_F(KelvoctlWithDaemonTest, StopPauseAndResumeWithoutARecordingAreStatus4) {
    for (const char* command : {"stop", "pause", "resume"})
        EXPECT_EQ(KelvoctlProcess::run(socket, {command}),
                  Answer(4, "kelvoctl: nothing is being recorded\n"));
}

TEST_F(KelvoctlWithDaemonTest, ProgramOutsideOfTheBundleIsNotTheShell) {
    const std::string copy = root.path() + "/kelvoctl";
    std::filesystem::copy_file(KELVOCTL_PROGRAM, copy);
    KelvoctlProcess process(socket, {"status"}, copy);
    EXPECT_EQ(process.waitForExit(), 1);
    EXPECT_EQ(process.output(), "kelvoctl: the daemon does not take this program for the system shell\n");
}

TEST_F(KelvoctlWithDaemonTest, OutputThatExistsIsRefusedBeforeAnythingIsRecorded) {
    const std::string path = root.write("there.mp4", "mine");
    EXPECT_EQ(KelvoctlProcess::run(socket, {"record", "--output", path}),
              Answer(2, "kelvoctl: " + path + ": File exists\n"));
}

TEST_F(KelvoctlWithDaemonTest, DaemonWithoutADisplayTellsWhatIsMissingAndKelvoctlWhatToDo) {
    const auto [status, text] = KelvoctlProcess::run(socket, {"record"});
    EXPECT_EQ(status, 1);
    EXPECT_NE(text.find("KVRecordingErrorDomain -5817)\nthe daemon has no display, or lost it."),
              std::string::npos)
        << text;
    EXPECT_NE(text.find("`systemctl --user import-environment DISPLAY XAUTHORITY`"), std::string::npos);
    EXPECT_TRUE(daemon.waitForLine(
        "cannot record the screen: there is no display, as DISPLAY is not set for the daemon"))
        << daemon.output();
    EXPECT_TRUE(daemon.waitForLine(
        "there is no display, as DISPLAY is not set for the daemon; what it shows is unknown"));
}

TEST_F(KelvoctlWithDaemonTest, OneShellAtATimeShowsAlerts) {
    KelvoctlProcess first(socket, {"shell", "--answer", "other"});
    ASSERT_TRUE(first.waitForLine("showing alerts")) << first.output();
    EXPECT_EQ(KelvoctlProcess::run(socket, {"shell"}),
              Answer(1, "kelvoctl: another shell shows the alerts\n"));
    first.signal(SIGINT);
    EXPECT_EQ(first.waitForExit(), 0);
    KelvoctlProcess next(socket, {"shell", "--answer", "other"});
    EXPECT_TRUE(next.waitForLine("showing alerts")) << next.output();
}

TEST_F(KelvoctlWithDaemonTest, ShellOutsideOfTheBundleIsRefused) {
    const std::string copy = root.path() + "/kelvoctl";
    std::filesystem::copy_file(KELVOCTL_PROGRAM, copy);
    KelvoctlProcess process(socket, {"shell"}, copy);
    EXPECT_EQ(process.waitForExit(), 1);
}

TEST_F(KelvoctlWithDaemonTest, CtrlCEndsAWatchWithSuccess) {
    KelvoctlProcess watch(socket, {"watch"});
    ASSERT_TRUE(watch.waitForLine("watching"));
    watch.signal(SIGINT);
    EXPECT_EQ(watch.waitForExit(), 0);
}

TEST_F(KelvoctlWithDaemonTest, DaemonThatIsKilledEndsAWatchWithStatus3) {
    KelvoctlProcess watch(socket, {"watch"});
    ASSERT_TRUE(watch.waitForLine("watching"));
    daemon.signal(SIGKILL);
    EXPECT_EQ(watch.waitForExit(), 3);
    EXPECT_EQ(watch.output(), "watching; Ctrl-C ends\nkelvoctl: the daemon went away\n");
}

}  // namespace
}  // namespace kelvo
