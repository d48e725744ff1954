#include "platform/simulated/SimulatedDevice.h"
#include "support/Threads.h"

#include <cerrno>
#include <set>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class RestrictionsListener : public RestrictionsObserver {
  public:
    void profileConnectionDidReceiveEffectiveSettingsChangedNotification(RestrictionsProfile& p) override {
        settings.push_back(p.effectiveSetting("r"));
    }
    std::vector<RestrictionSetting> settings;
};

class LayoutListener : public DisplayLayoutObserver {
  public:
    void layoutMonitorDidUpdateDisplayLayout(DisplayLayoutMonitor&, const DisplayLayout& layout) override {
        sizes.push_back(layout.elements.size());
    }
    std::vector<std::size_t> sizes;
};

TEST(SimulatedRestrictionsTest, ObserversHearOfChangesUntilTheyAreRemoved) {
    SimulatedRestrictions restrictions;
    const auto listener = std::make_shared<RestrictionsListener>();
    restrictions.addObserver(listener);
    EXPECT_EQ(restrictions.observerCount(), 1U);
    restrictions.change("r", RestrictionSetting::no);
    restrictions.change("r", RestrictionSetting::yes);
    restrictions.removeObserver(listener.get());
    restrictions.change("r", RestrictionSetting::no);
    EXPECT_THAT(listener->settings, ElementsAre(RestrictionSetting::no, RestrictionSetting::yes));
    EXPECT_EQ(restrictions.observerCount(), 0U);
}

TEST(SimulatedRestrictionsTest, ObserverThatIsGoneIsPassedOver) {
    SimulatedRestrictions restrictions;
    restrictions.addObserver(std::make_shared<RestrictionsListener>());
    restrictions.change("r", RestrictionSetting::no);
    EXPECT_EQ(restrictions.effectiveSetting("r"), RestrictionSetting::no);
    EXPECT_EQ(restrictions.effectiveSetting("other"), RestrictionSetting::unspecified);
}

TEST(SimulatedDisplayLayoutTest, ObserversHearOfChangesUntilTheMonitorEnds) {
    SimulatedDisplayLayout layout;
    const auto monitor = layout.createMonitor(0);
    const auto listener = std::make_shared<LayoutListener>();
    const auto removed = std::make_shared<LayoutListener>();
    monitor->addObserver(listener);
    monitor->addObserver(removed);
    monitor->removeObserver(removed.get());
    layout.change({{{0}, {1}}});
    EXPECT_EQ(monitor->currentLayout().elements.size(), 2U);
    EXPECT_FALSE(layout.isAnyMonitorInvalidated());
    monitor->invalidate();
    layout.change({});
    EXPECT_THAT(listener->sizes, ElementsAre(2U));
    EXPECT_THAT(removed->sizes, IsEmpty());
    EXPECT_TRUE(layout.isAnyMonitorInvalidated());
    EXPECT_EQ(layout.observerCount(), 0U);
    EXPECT_EQ(layout.monitorCount(), 1);
}

TEST(SimulatedAlertsTest, AlertIsAnsweredWhileItIsUp) {
    SimulatedDevice device;
    SystemAlertContent content;
    content.header = "header";
    const auto alert = *device.alerts->createAlert(content);
    SystemAlertResponse response{};
    test::BlockingCaller waiter([&] { response = alert->waitForResponse(); });
    waiter.awaitBlocked();
    device.answerAlert(SystemAlertResponse::alternateButton);
    waiter.join();
    EXPECT_EQ(response, SystemAlertResponse::alternateButton);
    ASSERT_EQ(device.alerts->shownAlerts().size(), 1U);
    EXPECT_EQ(device.alerts->shownAlerts()[0].header, "header");
}

TEST(SimulatedAlertsTest, PreparedAnswersGoToTheNextAlertsInOrder) {
    SimulatedDevice device;
    device.answerAlert(SystemAlertResponse::otherButton);
    device.answerAlert(SystemAlertResponse::defaultButton);
    EXPECT_EQ((*device.alerts->createAlert({}))->waitForResponse(), SystemAlertResponse::otherButton);
    EXPECT_EQ((*device.alerts->createAlert({}))->waitForResponse(), SystemAlertResponse::defaultButton);
}

TEST(SimulatedAlertsTest, CancelledAlertSaysSoAndAnAnsweredOneStaysAnswered) {
    SimulatedDevice device;
    const auto cancelled = *device.alerts->createAlert({});
    cancelled->cancel();
    EXPECT_EQ(cancelled->waitForResponse(), SystemAlertResponse::cancelled);
    device.answerAlert(SystemAlertResponse::defaultButton);
    const auto answered = *device.alerts->createAlert({});
    answered->cancel();
    EXPECT_EQ(answered->waitForResponse(), SystemAlertResponse::defaultButton);
}

TEST(SimulatedAlertsTest, AlertCanFail) {
    SimulatedDevice device;
    device.failNext("SystemAlert.createAlert", EIO);
    EXPECT_EQ(device.alerts->createAlert({}).error().code(), EIO);
    EXPECT_TRUE(device.alerts->shownAlerts().empty());
}

TEST(SimulatedBulletinsTest, RequestsAreKeptInOrder) {
    SimulatedBulletins bulletins;
    SerialQueue queue("label");
    bulletins.connect("service", queue)->registerDataProvider({})->withdrawAllBulletins();
    EXPECT_THAT(bulletins.requests(), ElementsAre("connect service label", "register", "withdraw all"));
}

TEST(SimulatedIPCTest, ListenersAreSuspendedUntilTheyAreResumed) {
    SimulatedIPC ipc;
    const auto listener = ipc.createListener("com.example");
    ASSERT_EQ(ipc.listeners().size(), 1U);
    EXPECT_EQ(ipc.listeners()[0]->serviceName(), "com.example");
    EXPECT_EQ(ipc.listeners()[0]->resumeCount(), 0);
    EXPECT_EQ(ipc.listeners()[0]->delegate(), nullptr);
    listener->resume();
    EXPECT_EQ(ipc.listeners()[0]->resumeCount(), 1);
}

TEST(SimulatedIPCTest, CurrentConnectionIsTheOneThatIsServed) {
    SimulatedIPC ipc;
    EXPECT_EQ(ipc.currentConnection(), nullptr);
    const auto connection = std::make_shared<SimulatedConnection>(7, Dictionary{{"right", true}});
    ipc.setCurrentConnection(connection);
    EXPECT_EQ(ipc.currentConnection()->processIdentifier(), 7);
    EXPECT_EQ(ipc.currentConnection()->valueForEntitlement("right"), Value(true));
    EXPECT_TRUE(ipc.currentConnection()->valueForEntitlement("other").isNothing());
}

TEST(SimulatedStoragePurgeTest, LaterRegistrationReplacesTheFirst) {
    SimulatedStoragePurge purge;
    StoragePurgeCallbacks callbacks;
    callbacks.purge = [](PurgeUrgency) { return std::uint64_t{1}; };
    purge.registerCallbacks("a", callbacks);
    callbacks.purge = [](PurgeUrgency urgency) { return static_cast<std::uint64_t>(urgency) * 10; };
    purge.registerCallbacks("a", callbacks);
    purge.registerCallbacks("b", callbacks);
    EXPECT_EQ(purge.purge(3), 60U);
    EXPECT_TRUE(purge.callbacks("a"));
    EXPECT_FALSE(purge.callbacks("c"));
}

TEST(SimulatedRandomTest, BytesDifferWithinARunAndAreTheSameInEveryRun) {
    std::array<std::byte, 64> first{};
    std::array<std::byte, 64> second{};
    std::array<std::byte, 64> otherRun{};
    SimulatedRandom random;
    random.fill(first);
    random.fill(second);
    SimulatedRandom().fill(otherRun);
    EXPECT_EQ(first, otherRun);
    EXPECT_NE(first, second);
    EXPECT_GT(std::set<std::byte>(first.begin(), first.end()).size(), 32U);
}

TEST(SimulatedDevicePropertiesTest, IsAnOrdinaryPhoneAtFirst) {
    SimulatedDeviceProperties device;
    EXPECT_EQ(device.idiom(), DeviceIdiom::phone);
    EXPECT_FALSE(device.isInternalBuild());
    EXPECT_EQ(device.chipIdentifier(), 0);
    EXPECT_EQ(device.mainScreenOrientation(), 0.0F);
    device.setIdiom(DeviceIdiom::tablet);
    device.setInternalBuild(true);
    device.setChipIdentifier(5);
    device.setMainScreenOrientation(std::nullopt);
    EXPECT_EQ(device.idiom(), DeviceIdiom::tablet);
    EXPECT_TRUE(device.isInternalBuild());
    EXPECT_EQ(device.chipIdentifier(), 5);
    EXPECT_EQ(device.mainScreenOrientation(), std::nullopt);
}

TEST(SimulatedPreferencesTest, ReadsAreCounted) {
    SimulatedPreferences preferences;
    preferences.value("a", kPreferencesDomain);
    preferences.value("b", "other");
    EXPECT_EQ(preferences.readCount(), 2);
}

TEST(SimulatedNotificationsTest, ObserversAndRemovalsAreCounted) {
    SimulatedNotifications notifications;
    notifications.registerForNotification("n", QueuePriority::low, [](NotificationToken) {});
    EXPECT_EQ(notifications.observerCount("n"), 1U);
    notifications.removeObservers("n");
    EXPECT_EQ(notifications.observerCount("n"), 0U);
    EXPECT_EQ(notifications.removalCount("n"), 1);
    EXPECT_EQ(notifications.removalCount("m"), 0);
}

TEST(SimulatedBundlesTest, RemovedBundleAndItsFoldersAreGone) {
    SimulatedBundles bundles;
    SimulatedBundleContent content;
    content.tables["en"]["Localizable"]["K"] = "t";
    bundles.addBundle("/a", content);
    bundles.addBundle("/ab", {});
    bundles.removeBundle("/a");
    EXPECT_EQ(bundles.bundleAtPath("/a"), nullptr);
    EXPECT_EQ(bundles.bundleAtPath("/a/en.lproj"), nullptr);
    EXPECT_NE(bundles.bundleAtPath("/ab"), nullptr);
    EXPECT_EQ(bundles.openCount("/a"), 1);
}

TEST(SimulatedBundlesTest, ProcessEnds) {
    SimulatedBundles bundles;
    bundles.addProcess(1, "/bin/a");
    EXPECT_EQ(bundles.executablePath(1), "/bin/a");
    bundles.removeProcess(1);
    EXPECT_EQ(bundles.executablePath(1), std::nullopt);
}

TEST(SimulatedBundlesTest, EntitlementsAreThoseThatATestGives) {
    SimulatedBundles bundles;
    SimulatedBundleContent content;
    content.entitlements = {{"right", true}};
    bundles.addBundle("/a", content);
    EXPECT_EQ(bundles.bundleAtPath("/a")->entitlements(), (Dictionary{{"right", true}}));
}

TEST(SimulatedFileSystemTest, AgedFileIsThatOld) {
    const auto clock = std::make_shared<SimulatedClock>();
    SimulatedFileSystem files(clock, std::make_shared<SimulatedFaults>());
    files.addFile("/a/b", 3, std::chrono::hours(1));
    EXPECT_EQ(clock->now() - files.attributesOfItem("/a/b")->modificationDate, std::chrono::hours(1));
    EXPECT_TRUE(files.attributesOfItem("/a")->isDirectory);
    EXPECT_EQ(files.hostPath("/a/b"), "/a/b");
}

TEST(SimulatedFileSystemTest, RelativePathIsTakenFromTheRoot) {
    SimulatedFileSystem files(std::make_shared<SimulatedClock>(), std::make_shared<SimulatedFaults>());
    EXPECT_EQ(files.createDirectory("a/b"), std::nullopt);
    EXPECT_TRUE(files.itemExists("/a/b"));
}

}  // namespace
}  // namespace kelvo
