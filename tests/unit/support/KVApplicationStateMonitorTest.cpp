#include "platform/simulated/SimulatedDevice.h"
#include "support/KVApplicationStateMonitor.h"
#include "support/LogRecorder.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class Client : public KVApplicationStateObserver {
  public:
    void clientApplicationDidEnterBackground() override { note("background"); }
    void clientApplicationDidEnterForeground() override { note("foreground"); }
    std::vector<std::string> events;
    /// When set, is run by each event.
    std::function<void()> onEvent;

  private:
    void note(const std::string& event) {
        events.push_back(event);
        if (onEvent) onEvent();
    }
};

class System : public KVSystemStateObserver {
  public:
    void frontmostApplicationDidChange(std::int32_t process) override { note("changed", process); }
    void frontmostApplicationWasTerminated(std::int32_t process) override { note("terminated", process); }
    void frontmostApplicationDidEnterBackground(std::int32_t process) override {
        note("background", process);
    }
    std::vector<std::string> events;
    /// When set, is run by each event.
    std::function<void()> onEvent;

  private:
    void note(const std::string& event, std::int32_t process) {
        events.push_back(event + " " + std::to_string(process));
        if (onEvent) onEvent();
    }
};

class KVApplicationStateMonitorTest : public testing::Test {
  protected:
    void change(std::int32_t process, std::int32_t state, bool isFrontmost = false,
                const std::string& bundle = "app") {
        device.applications->change({state, process, isFrontmost, bundle});
        device.settle();
    }

    const test::LogRecorder log;
    SimulatedDevice device;
    const std::shared_ptr<KVApplicationStateMonitor> monitor =
        std::make_shared<KVApplicationStateMonitor>(device.applications);
    const std::shared_ptr<Client> client = std::make_shared<Client>();
    const std::shared_ptr<System> system = std::make_shared<System>();
};

TEST_F(KVApplicationStateMonitorTest, ListensExactlyWhileSomebodyObserves) {
    EXPECT_FALSE(device.applications->hasUpdateHandler());
    monitor->addObserver(client, 10);
    monitor->addSystemObserver(system);
    EXPECT_EQ(monitor->observersCount(), 2U);
    monitor->removeObserverWithProcessIdentifier(10);
    EXPECT_TRUE(device.applications->hasUpdateHandler());
    monitor->removeSystemObserver();
    EXPECT_EQ(monitor->observersCount(), 0U);
    EXPECT_FALSE(device.applications->hasUpdateHandler());
    monitor->addSystemObserver(system);
    EXPECT_TRUE(device.applications->hasUpdateHandler());
}

TEST_F(KVApplicationStateMonitorTest, MonitorThatGoesEndsItsWatch) {
    auto other = std::make_shared<KVApplicationStateMonitor>(device.applications);
    other->addSystemObserver(system);
    other.reset();
    EXPECT_FALSE(device.applications->hasUpdateHandler());
}

TEST_F(KVApplicationStateMonitorTest, SecondObserversReplaceTheFirst) {
    const auto secondClient = std::make_shared<Client>();
    const auto secondSystem = std::make_shared<System>();
    monitor->addObserver(client, 10);
    monitor->addObserver(secondClient, 10);
    monitor->addSystemObserver(system);
    monitor->addSystemObserver(secondSystem);
    EXPECT_EQ(monitor->observersCount(), 2U);
    change(10, 8, true);
    EXPECT_THAT(client->events, IsEmpty());
    EXPECT_THAT(system->events, IsEmpty());
    EXPECT_THAT(secondClient->events, ElementsAre("foreground"));
    EXPECT_THAT(secondSystem->events, ElementsAre("changed 10"));
}

TEST_F(KVApplicationStateMonitorTest, ClientInTheForegroundLeavesItOnce) {
    change(10, 8);
    monitor->addObserver(client, 10);
    change(10, 32);
    change(10, 8);
    EXPECT_THAT(client->events, IsEmpty());
    change(10, 4);
    change(10, 2);
    EXPECT_THAT(client->events, ElementsAre("background"));
    change(10, 32);
    EXPECT_THAT(client->events, ElementsAre("background", "foreground"));
}

TEST_F(KVApplicationStateMonitorTest, ClientThatNobodyKnowsBeginsInTheBackground) {
    monitor->addObserver(client, 10);
    EXPECT_TRUE(log.contains("addObserver:processIdentifier: state 0"));
    change(10, 4);
    EXPECT_THAT(client->events, IsEmpty());
    change(10, 8);
    EXPECT_THAT(client->events, ElementsAre("foreground"));
    EXPECT_TRUE(log.contains("notifyInAppSessionShouldPauseOrResume: processIdentifer 10 observer nonnil 1"));
    EXPECT_TRUE(log.contains("notifyInAppSessionShouldPauseOrResume: state 8 previousState 4"));
    EXPECT_TRUE(
        log.contains("notifyInAppSessionShouldPauseOrResume: calling clientApplicationDidEnterForeground"));
}

TEST_F(KVApplicationStateMonitorTest, ProcessWithoutAnObserverKeepsItsPreviousState) {
    change(10, 8);
    monitor->addObserver(client, 10);
    monitor->addObserver(std::make_shared<Client>(), 11);
    monitor->removeObserverWithProcessIdentifier(10);
    change(10, 4);
    EXPECT_TRUE(log.contains("notifyInAppSessionShouldPauseOrResume: processIdentifer 10 observer nonnil 0"));
    change(11, 8);
    EXPECT_TRUE(log.contains(
        "notifyInAppSessionShouldPauseOrResume: state 8 previousState {\"10\" = 8; \"11\" = 8}"));
    EXPECT_THAT(client->events, IsEmpty());
}

TEST_F(KVApplicationStateMonitorTest, NewStateCountsOnceItsClientHasHeardOfIt) {
    change(10, 8);
    monitor->addObserver(client, 10);
    client->onEvent = [this] { monitor->addObserver(std::make_shared<Client>(), 11); };
    change(10, 4);
    EXPECT_THAT(client->events, ElementsAre("background"));
    EXPECT_TRUE(
        log.contains("addObserver:processIdentifier: processIdentifier 11 userInfo (none) "
                     "previousState {\"10\" = 8}"));
    EXPECT_TRUE(log.contains("notifyInAppSessionShouldPauseOrResume: state 4 previousState {\"10\" = 4}"));
}

TEST_F(KVApplicationStateMonitorTest, ObserverThatTheSystemsNewsBringCounts) {
    monitor->addSystemObserver(system);
    change(10, 4);
    system->onEvent = [this] { monitor->addObserver(client, 11); };
    change(10, 2);
    EXPECT_TRUE(log.contains("notifyInAppSessionShouldPauseOrResume: processIdentifer 10 observer nonnil 0"));
}

TEST_F(KVApplicationStateMonitorTest, TerminatedApplicationBehindTheFrontEndsAndLeaves) {
    monitor->addSystemObserver(system);
    change(10, 1);
    EXPECT_THAT(system->events, ElementsAre("terminated 10", "background 10"));
}

TEST_F(KVApplicationStateMonitorTest, TerminatedApplicationInFrontEndsAndIsToldAsFrontmost) {
    monitor->addSystemObserver(system);
    change(10, 1, true);
    EXPECT_THAT(system->events, ElementsAre("terminated 10", "changed 10"));
}

TEST_F(KVApplicationStateMonitorTest, ObscuredApplicationIsNotTakenForOneInTheBackground) {
    monitor->addSystemObserver(system);
    change(10, 32);
    EXPECT_THAT(system->events, IsEmpty());
    change(10, 4);
    EXPECT_THAT(system->events, ElementsAre("background 10"));
}

TEST_F(KVApplicationStateMonitorTest, ScreenshotServiceNeverComesToTheFront) {
    monitor->addSystemObserver(system);
    change(10, 8, true, "com.quillon.ShotframeServicesService");
    EXPECT_THAT(system->events, IsEmpty());
}

TEST_F(KVApplicationStateMonitorTest, StaleUpdateOfTheFrontmostApplicationIsDropped) {
    monitor->addSystemObserver(system);
    change(11, 8, true, "other");
    device.applications->report({8, 10, true, "app"});
    device.settle();
    EXPECT_THAT(system->events, ElementsAre("changed 11"));
}

TEST_F(KVApplicationStateMonitorTest, WithoutAFrontmostApplicationTheAnswerComesAtOnce) {
    std::vector<std::int32_t> answers;
    monitor->frontmostApplicationProcessIdentifier([&](std::int32_t pid) { answers.push_back(pid); });
    EXPECT_THAT(answers, ElementsAre(-1));
}

TEST_F(KVApplicationStateMonitorTest, FrontmostProcessIsFoundByItsApplication) {
    std::vector<std::int32_t> answers;
    change(10, 8, true);
    monitor->frontmostApplicationProcessIdentifier([&](std::int32_t pid) { answers.push_back(pid); });
    device.settle();
    EXPECT_THAT(answers, ElementsAre(10));
    change(10, 1, true);
    monitor->frontmostApplicationProcessIdentifier([&](std::int32_t pid) { answers.push_back(pid); });
    device.settle();
    EXPECT_THAT(answers, ElementsAre(10, 0)) << "an application without a process";
}

TEST_F(KVApplicationStateMonitorTest, OnlyTheStateEightIsTheForeground) {
    EXPECT_FALSE(monitor->isApplicationInForegroundWithBundleIdentifier("app"));
    for (const auto& [state, isForeground] :
         std::map<std::int32_t, bool>{{4, false}, {8, true}, {32, false}}) {
        change(10, state);
        EXPECT_EQ(monitor->isApplicationInForegroundWithBundleIdentifier("app"), isForeground) << state;
    }
}

}  // namespace
}  // namespace kelvo
