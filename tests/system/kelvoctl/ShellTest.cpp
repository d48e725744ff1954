#include "KelvoctlProcess.h"
#include "ipc/ShellAlerts.h"
#include "platform/linux/bundles/LinuxBundleService.h"
#include "platform/linux/bundles/LocaleLanguages.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "support/Eventually.h"
#include "support/TemporaryDirectory.h"

#include <csignal>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using test::KelvoctlProcess;

const SystemAlertContent kContent{"Record?", "Everything on the screen.", "Decline", "", "Record", ""};

/// Alerts of this process, shown by kelvoctl as a process of its own.
class ShellTest : public testing::Test {
  protected:
    const test::TemporaryDirectory root;
    const std::string socket = root.path() + "/run/kelvod/com.quillon.kelvod";
    const std::shared_ptr<const DeviceRoot> device = std::make_shared<const DeviceRoot>(root.path(), "");
    const std::shared_ptr<SocketTransport> transport = std::make_shared<SocketTransport>(
        device, std::make_shared<LinuxBundleService>(device, std::make_shared<LocaleLanguages>()));
    const std::shared_ptr<ShellAlerts> alerts = ShellAlerts::create(transport);
};

TEST_F(ShellTest, ScriptAnswersWithTheButtonItNames) {
    KelvoctlProcess shell(socket, {"shell", "--answer", "other"});
    ASSERT_TRUE(shell.waitForLine("showing alerts")) << shell.output();
    const auto alert = alerts->createAlert(kContent);
    ASSERT_TRUE(alert);
    EXPECT_EQ((*alert)->waitForResponse(), SystemAlertResponse::otherButton);
    ASSERT_TRUE(shell.waitForLine("answered: Record"));
    EXPECT_NE(shell.output().find("\nRecord?\nEverything on the screen.\n  [d] Decline\n  [o] Record\n"),
              std::string::npos)
        << shell.output();
}

TEST_F(ShellTest, ButtonThatTheAlertLacksIsNoConsent) {
    KelvoctlProcess shell(socket, {"shell", "--answer", "alternate"});
    ASSERT_TRUE(shell.waitForLine("showing alerts"));
    EXPECT_EQ((*alerts->createAlert(kContent))->waitForResponse(), SystemAlertResponse::cancelled);
}

TEST_F(ShellTest, KeysAnswerOneAlertAfterTheOther) {
    const std::string keyboard = root.path() + "/keyboard";
    ASSERT_EQ(::mkfifo(keyboard.c_str(), 0600), 0);
    const UniqueFd keys(::open(keyboard.c_str(), O_RDWR | O_CLOEXEC));
    test::ChildProcess shell({"sh", "-c", "exec \"$0\" shell <\"$1\" 1>&2", KELVOCTL_PROGRAM, keyboard},
                             {{"KELVO_SOCKET", socket}});
    ASSERT_TRUE(shell.waitForLine("showing alerts"));
    const auto first = *alerts->createAlert(kContent);
    ASSERT_TRUE(shell.waitForLine("[o] Record")) << shell.output();
    const auto second = *alerts->createAlert(kContent);
    // Neither is a button of this alert but the last.
    ASSERT_EQ(::write(keys.get(), "xad", 3), 3);
    EXPECT_EQ(first->waitForResponse(), SystemAlertResponse::defaultButton);
    ASSERT_TRUE(shell.waitForLine("answered: Decline\n\nRecord?")) << shell.output();
    ASSERT_EQ(::write(keys.get(), "O", 1), 1);
    EXPECT_EQ(second->waitForResponse(), SystemAlertResponse::otherButton);
}

TEST_F(ShellTest, AlertIsWithdrawnFromTheScreen) {
    KelvoctlProcess shell(socket, {"shell", "--json"});
    ASSERT_TRUE(test::eventually([&] { return static_cast<bool>(alerts->createAlert(kContent)); }));
    (*alerts->createAlert(kContent))->cancel();
    EXPECT_TRUE(shell.waitForLine("{\"withdrawn\":2}")) << shell.output();
}

TEST_F(ShellTest, ShellThatIsKilledEndsItsAlerts) {
    KelvoctlProcess shell(socket, {"shell", "--json"});
    ASSERT_TRUE(test::eventually([&] { return static_cast<bool>(alerts->createAlert(kContent)); }));
    const auto alert = *alerts->createAlert(kContent);
    ASSERT_TRUE(shell.waitForLine("\"buttons\"")) << shell.output();
    shell.signal(SIGKILL);
    EXPECT_EQ(alert->waitForResponse(), SystemAlertResponse::cancelled);
    EXPECT_TRUE(test::eventually([&] { return !alerts->createAlert(kContent); }));
}

}  // namespace
}  // namespace kelvo
