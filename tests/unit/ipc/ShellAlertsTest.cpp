#include "ipc/ShellAlerts.h"
#include "platform/simulated/SimulatedIPC.h"

#include <cerrno>
#include <future>
#include <thread>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

const SystemAlertContent kContent{"Title", "Text", "No", "Yes", "Less", ""};

/// A shell that remembers what it was told to show.
class RecordingShell : public KVAlertShellProtocol {
  public:
    void showAlert(std::int64_t identifier, const std::string& header, const std::string& message,
                   const std::string& defaultButton, const std::string& alternateButton,
                   const std::string& otherButton) override {
        told.with([&](auto& all) {
            all.push_back("show " + std::to_string(identifier) + " " + header + "|" + message + "|" +
                          defaultButton + "|" + alternateButton + "|" + otherButton);
        });
    }
    void cancelAlert(std::int64_t identifier) override {
        told.with([&](auto& all) { all.push_back("cancel " + std::to_string(identifier)); });
    }

    Guarded<std::vector<std::string>> told;
};

class ShellAlertsTest : public testing::Test {
  protected:
    struct Shell {
        std::shared_ptr<RecordingShell> screen = std::make_shared<RecordingShell>();
        IPCConnectionRef connection;
        std::shared_ptr<RemoteAlertService> service;
        OptionalError refusal;
    };

    /// A process that registers.
    Shell connect(std::int32_t processIdentifier, bool isEntitled = true) {
        Dictionary rights;
        if (isEntitled) rights.set("com.quillon.private.kelvo-kit", true);
        ipc->setIdentity(processIdentifier, rights);
        Shell shell;
        shell.connection = *ipc->connectToService(kAlertServiceName);
        shell.connection->setExported(
            interfaceOf<KVAlertShellProtocol>(),
            std::make_shared<ProtocolDispatcher<KVAlertShellProtocol>>(shell.screen));
        shell.connection->setRemoteInterface(interfaceOf<KVAlertServiceProtocol>());
        shell.connection->resume();
        shell.service = std::make_shared<RemoteAlertService>(*shell.connection, nullptr);
        std::promise<OptionalError> answer;
        shell.service->registerAlertShell([&](const OptionalError& error) { answer.set_value(error); });
        shell.refusal = answer.get_future().get();
        return shell;
    }
    std::shared_ptr<SystemAlert> create() {
        auto created = alerts->createAlert(kContent);
        settle();
        return created ? *created : nullptr;
    }
    void settle() {
        while (ipc->settle()) {
        }
    }

    const std::shared_ptr<SimulatedIPC> ipc = std::make_shared<SimulatedIPC>();
    const std::shared_ptr<ShellAlerts> alerts = ShellAlerts::create(ipc);
};

TEST_F(ShellAlertsTest, WithoutAShellNoAlertCanBeCreated) {
    const auto alert = alerts->createAlert(kContent);
    ASSERT_FALSE(alert);
    EXPECT_EQ(alert.error().code(), ENOTCONN);
}

TEST_F(ShellAlertsTest, ProcessWithoutTheRightIsRefusedAndShowsNothing) {
    const Shell shell = connect(7, false);
    ASSERT_TRUE(shell.refusal);
    EXPECT_EQ(shell.refusal->code(), EPERM);
    EXPECT_FALSE(alerts->createAlert(kContent));
}

TEST_F(ShellAlertsTest, ShellIsToldHeaderTextAndButtons) {
    const Shell shell = connect(7);
    ASSERT_FALSE(shell.refusal);
    const auto alert = create();
    EXPECT_THAT(shell.screen->told.copy(), ElementsAre("show 1 Title|Text|No|Yes|Less"));
}

TEST_F(ShellAlertsTest, EachButtonAnswersAndAnythingElseIsCancelled) {
    const Shell shell = connect(7);
    for (const int response : {0, 1, 2, 3, 4, -1}) {
        const auto alert = create();
        const auto identifier = static_cast<std::int64_t>(shell.screen->told.copy().size());
        shell.service->alertDidEnd(identifier, response);
        const int expected = response >= 0 && response <= 2 ? response : 3;
        EXPECT_EQ(static_cast<int>(alert->waitForResponse()), expected);
    }
}

TEST_F(ShellAlertsTest, WaitingEndsWithTheAnswer) {
    const Shell shell = connect(7);
    const auto alert = create();
    auto response = std::async(std::launch::async, [&] { return alert->waitForResponse(); });
    shell.service->alertDidEnd(1, 1);
    EXPECT_EQ(response.get(), SystemAlertResponse::alternateButton);
}

TEST_F(ShellAlertsTest, FirstAnswerCounts) {
    const Shell shell = connect(7);
    const auto alert = create();
    shell.service->alertDidEnd(1, 2);
    shell.service->alertDidEnd(1, 0);
    settle();
    EXPECT_EQ(alert->waitForResponse(), SystemAlertResponse::otherButton);
}

TEST_F(ShellAlertsTest, AnswerToAnotherAlertIsPassedOver) {
    const Shell shell = connect(7);
    const auto alert = create();
    shell.service->alertDidEnd(99, 1);
    settle();
    alert->cancel();
    EXPECT_EQ(alert->waitForResponse(), SystemAlertResponse::cancelled);
}

TEST_F(ShellAlertsTest, CancelledAlertGoesFromTheScreenOnce) {
    const Shell shell = connect(7);
    auto alert = create();
    alert->cancel();
    alert->cancel();
    alert.reset();
    settle();
    EXPECT_THAT(shell.screen->told.copy(), ElementsAre("show 1 Title|Text|No|Yes|Less", "cancel 1"));
}

TEST_F(ShellAlertsTest, AnsweredAlertIsNotCancelled) {
    const Shell shell = connect(7);
    auto alert = create();
    shell.service->alertDidEnd(1, 0);
    EXPECT_EQ(alert->waitForResponse(), SystemAlertResponse::defaultButton);
    alert->cancel();
    alert.reset();
    settle();
    EXPECT_EQ(shell.screen->told.copy().size(), 1U);
}

TEST_F(ShellAlertsTest, AlertThatNobodyHoldsGoesFromTheScreen) {
    const Shell shell = connect(7);
    create();
    settle();
    EXPECT_EQ(shell.screen->told.copy().back(), "cancel 1");
}

TEST_F(ShellAlertsTest, AlertsOfAShellThatDiesAreCancelledAndNoMoreCanBeCreated) {
    const Shell shell = connect(7);
    const auto alert = create();
    shell.connection->invalidate();
    EXPECT_EQ(alert->waitForResponse(), SystemAlertResponse::cancelled);
    settle();
    EXPECT_FALSE(alerts->createAlert(kContent));
}

TEST_F(ShellAlertsTest, SecondShellIsRefusedUntilTheFirstHasGone) {
    const Shell first = connect(7);
    const Shell second = connect(8);
    ASSERT_TRUE(second.refusal);
    EXPECT_EQ(second.refusal->code(), EBUSY);
    second.connection->invalidate();
    settle();
    const auto alert = create();
    EXPECT_EQ(first.screen->told.copy().size(), 1U);
    EXPECT_THAT(second.screen->told.copy(), IsEmpty());
    first.connection->invalidate();
    settle();
    EXPECT_FALSE(connect(9).refusal);
}

TEST_F(ShellAlertsTest, AnswerFromAnotherProcessDoesNotCount) {
    const Shell shell = connect(7);
    const Shell other = connect(8);
    const auto alert = create();
    other.service->alertDidEnd(1, 1);
    settle();
    shell.service->alertDidEnd(1, 0);
    EXPECT_EQ(alert->waitForResponse(), SystemAlertResponse::defaultButton);
}

TEST(AlertProtocolsTest, SignaturesOnTheWire) {
    const auto signatureOf = [](const IPCMethod& method) {
        std::string text;
        for (const IPCArgument& argument : method.arguments)
            text += argument.signature;
        return text;
    };
    const auto& service = interfaceOf<KVAlertServiceProtocol>()->methods;
    const auto& shell = interfaceOf<KVAlertShellProtocol>()->methods;
    EXPECT_EQ(service[0].reply->at(0).signature, "a(sxa{sv})");
    EXPECT_EQ(signatureOf(service[1]), "xi");
    EXPECT_TRUE(service[1].isOneWay());
    EXPECT_EQ(signatureOf(shell[0]), "xsssss");
    EXPECT_EQ(signatureOf(shell[1]), "x");
}

TEST_F(ShellAlertsTest, ClosedServiceTakesItsAlertsAwayAndShowsNone) {
    const Shell shell = connect(10);
    const auto alert = *alerts->createAlert(kContent);
    alerts->close();
    EXPECT_EQ(alert->waitForResponse(), SystemAlertResponse::cancelled);
    EXPECT_EQ(alerts->createAlert(kContent).error().code(), ENOTCONN);
}

}  // namespace
}  // namespace kelvo
