#include "platform/linux/x11/X11Applications.h"
#include "platform/linux/x11/X11DisplayLayout.h"
#include "platform/linux/x11/X11RenderServer.h"
#include "platform/linux/x11/XConnection.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/ChildProcess.h"
#include "support/Eventually.h"
#include "support/TemporaryDirectory.h"
#include "support/x11/WindowManager.h"
#include "support/x11/XClient.h"
#include "support/x11/XvfbServer.h"

#include <atomic>
#include <csignal>
#include <cstdlib>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo::x11 {
namespace {

using test::eventually;

/// This process and another one as two applications on one display.
class X11ApplicationsTest : public testing::Test {
  protected:
    X11ApplicationsTest() {
        device_.bundles->addProcess(::getpid(), "/Applications/Own.app/own");
        addBundle("/Applications/Own.app", "own");
    }
    ~X11ApplicationsTest() override { applications_.setUpdateHandler(nullptr); }

    /// Starts the other application with one window; its bundle is "other".
    std::unique_ptr<test::ChildProcess> startOther(const std::string& geometry) {
        // Its window comes when it is known whose it is: nothing tells of that afterwards.
        const test::TemporaryDirectory folder;
        auto other = std::make_unique<test::ChildProcess>(std::vector<std::string>{
            "sh", "-c",
            "while [ ! -e " + folder.path() + "/known ]; do sleep 0.01; done; exec xev -display " +
                server_.display() + " -geometry " + geometry});
        device_.bundles->addProcess(other->processIdentifier(), "/Applications/Other.app/other");
        addBundle("/Applications/Other.app", "other");
        folder.write("known", "");
        EXPECT_TRUE(eventually(
            [&] { return applications_.stateOfApplication("other") >= kApplicationStateForeground; }));
        return other;
    }
    void addBundle(const std::string& path, const std::string& identifier) {
        SimulatedBundleContent content;
        content.bundleIdentifier = identifier;
        device_.bundles->addBundle(path, std::move(content));
    }
    std::vector<xcb_window_t> topLevelWindows() {
        const XOwned<xcb_query_tree_reply_t> tree(
            xcb_query_tree_reply(client_.raw(), xcb_query_tree(client_.raw(), client_.root()), nullptr));
        const xcb_window_t* const children = xcb_query_tree_children(tree.get());
        return {children, children + xcb_query_tree_children_length(tree.get())};
    }
    std::int32_t ownState() { return applications_.stateOfApplication("own"); }

    void watch() {
        applications_.setUpdateHandler([updates = updates_](const ApplicationInformation& update) {
            updates->with([&](auto& all) { all.push_back(update); });
        });
    }
    bool wasTold(const std::string& identifier, std::int32_t state, bool isFrontmost) {
        return eventually([&] {
            for (const auto& update : updates_->copy()) {
                if (update.bundleIdentifier == identifier && update.state == state &&
                    update.isFrontmost == isFrontmost)
                    return true;
            }
            return false;
        });
    }

    SimulatedDevice device_;
    test::XvfbServer server_{400, 300, test::XvfbServer::ownDisplay()};
    test::XClient client_{server_.display()};
    X11Applications applications_{server_.display(), device_.bundles};
    std::shared_ptr<Guarded<std::vector<ApplicationInformation>>> updates_ =
        std::make_shared<Guarded<std::vector<ApplicationInformation>>>();
};

TEST_F(X11ApplicationsTest, EmptyDisplayHasNoApplications) {
    EXPECT_EQ(applications_.frontmostApplicationBundleIdentifier(), std::nullopt);
    EXPECT_EQ(applications_.informationOfProcess(::getpid()), std::nullopt);
    EXPECT_EQ(ownState(), kApplicationStateUnknown);
    EXPECT_EQ(applications_.stateOfApplication(""), kApplicationStateUnknown);
}

TEST_F(X11ApplicationsTest, ApplicationWithTheInputIsFrontmost) {
    const test::WindowManager manager(server_.display());
    ASSERT_TRUE(manager.isReady());
    client_.createWindow({0, 0, 50, 50}, 0, true);
    ASSERT_TRUE(eventually([&] { return ownState() == kApplicationStateForeground; }));
    EXPECT_EQ(applications_.frontmostApplicationBundleIdentifier(), "own");
    const auto information = applications_.informationOfProcess(::getpid());
    ASSERT_TRUE(information);
    EXPECT_TRUE(information->isFrontmost);
    EXPECT_EQ(information->bundleIdentifier, "own");
}

TEST_F(X11ApplicationsTest, ApplicationThatAnotherOneTookTheInputFromIsObscured) {
    const test::WindowManager manager(server_.display());
    ASSERT_TRUE(manager.isReady());
    client_.createWindow({0, 0, 50, 50}, 0, true);
    ASSERT_TRUE(eventually([&] { return ownState() == kApplicationStateForeground; }));
    watch();
    const auto other = startOther("60x60+100+100");
    EXPECT_TRUE(wasTold("own", kApplicationStateForegroundObscured, false));
    EXPECT_TRUE(wasTold("other", kApplicationStateForeground, true));
    EXPECT_EQ(applications_.frontmostApplicationBundleIdentifier(), "other");
    EXPECT_EQ(ownState(), kApplicationStateForegroundObscured);
}

TEST_F(X11ApplicationsTest, ApplicationWithoutVisibleWindowsIsInTheBackground) {
    const test::WindowManager manager(server_.display());
    ASSERT_TRUE(manager.isReady());
    const auto window = client_.createWindow({0, 0, 50, 50}, 0, true);
    ASSERT_TRUE(eventually([&] { return ownState() == kApplicationStateForeground; }));
    watch();
    client_.unmap(window);
    EXPECT_TRUE(wasTold("own", kApplicationStateBackground, false));
}

TEST_F(X11ApplicationsTest, MinimizedApplicationIsInTheBackground) {
    const test::WindowManager manager(server_.display());
    ASSERT_TRUE(manager.isReady());
    const auto window = client_.createWindow({0, 0, 50, 50}, 0, true);
    ASSERT_TRUE(eventually([&] { return ownState() == kApplicationStateForeground; }));
    watch();
    test::ChildProcess minimize({"xdotool", "windowminimize", std::to_string(window)},
                                {{"DISPLAY", server_.display()}});
    EXPECT_TRUE(wasTold("own", kApplicationStateBackground, false));
    EXPECT_TRUE(eventually([&] { return ownState() == kApplicationStateBackground; }));
}

TEST_F(X11ApplicationsTest, ApplicationThatEndsIsTerminated) {
    const test::WindowManager manager(server_.display());
    ASSERT_TRUE(manager.isReady());
    const auto other = startOther("60x60+100+100");
    watch();
    other->signal(SIGKILL);
    EXPECT_TRUE(wasTold("other", kApplicationStateTerminated, false));
}

TEST_F(X11ApplicationsTest, ProgramWithoutABundleGoesByItsPath) {
    const auto other = startOther("60x60+100+100");
    device_.bundles->addProcess(::getpid(), "/usr/bin/tool");
    client_.createWindow({0, 0, 50, 50}, 0, true);
    EXPECT_TRUE(applications_.stateOfApplication("/usr/bin/tool") >= kApplicationStateForeground);
}

TEST_F(X11ApplicationsTest, WithoutAWindowManagerTheFocusDecides) {
    const auto window = client_.createWindow({0, 0, 50, 50}, 0, true);
    watch();
    xcb_set_input_focus(client_.raw(), XCB_INPUT_FOCUS_PARENT, window, XCB_CURRENT_TIME);
    client_.sync();
    EXPECT_TRUE(wasTold("own", kApplicationStateForeground, true));
    EXPECT_EQ(applications_.frontmostApplicationBundleIdentifier(), "own");
}

TEST_F(X11ApplicationsTest, MenusAreNoApplicationsWithoutAWindowManager) {
    client_.createWindow({0, 0, 50, 50}, 0, false);
    EXPECT_EQ(ownState(), kApplicationStateUnknown);
}

TEST_F(X11ApplicationsTest, InformationOfAnApplicationComesLater) {
    const auto other = startOther("60x60+100+100");
    std::atomic<int> process{0};
    applications_.informationOfApplication("other", [&](const auto& information) {
        process = information ? information->processIdentifier : -1;
    });
    EXPECT_TRUE(eventually([&] { return process == other->processIdentifier(); }));
    applications_.informationOfApplication("unknown",
                                           [&](const auto& information) { process = information ? 1 : -1; });
    EXPECT_TRUE(eventually([&] { return process == -1; }));
}

TEST_F(X11ApplicationsTest, WithoutAHandlerNothingIsTold) {
    watch();
    applications_.setUpdateHandler(nullptr);
    const auto other = startOther("60x60+100+100");
    EXPECT_TRUE(updates_->copy().empty());
    watch();
    other->signal(SIGKILL);
    EXPECT_TRUE(wasTold("other", kApplicationStateTerminated, false));
}

TEST_F(X11ApplicationsTest, LostDisplayHidesEveryApplicationAndItsSuccessorIsWatched) {
    client_.createWindow({0, 0, 50, 50}, 0, true);
    watch();
    server_.kill();
    EXPECT_TRUE(wasTold("own", kApplicationStateBackground, false));
    EXPECT_EQ(ownState(), kApplicationStateUnknown);
    const test::XvfbServer successor(400, 300, server_.display());
    test::XClient client(successor.display());
    updates_->set({});
    client.createWindow({0, 0, 50, 50}, 0, true);
    EXPECT_TRUE(wasTold("own", kApplicationStateForegroundObscured, false) ||
                wasTold("own", kApplicationStateForeground, true));
}

TEST_F(X11ApplicationsTest, FrozenDisplayDoesNotHoldUpTheEnd) {
    client_.createWindow({0, 0, 50, 50}, 0, true);
    watch();
    EXPECT_TRUE(eventually([&] { return ownState() != kApplicationStateUnknown; }));
    server_.freeze();
    EXPECT_EQ(ownState(), kApplicationStateUnknown);  // after two seconds
    applications_.setUpdateHandler(nullptr);
    server_.thaw();
}

TEST_F(X11ApplicationsTest, FrozenDisplayAnswersAgainOnceItGoesOn) {
    client_.createWindow({0, 0, 50, 50}, 0, true);
    EXPECT_TRUE(eventually([&] { return ownState() != kApplicationStateUnknown; }));
    server_.freeze();
    EXPECT_EQ(ownState(), kApplicationStateUnknown);
    EXPECT_EQ(ownState(), kApplicationStateUnknown);
    server_.thaw();
    EXPECT_TRUE(eventually([&] { return ownState() != kApplicationStateUnknown; }));
}

TEST_F(X11ApplicationsTest, DisplayThatIsFrozenFromTheStartHoldsUpNobody) {
    server_.freeze();
    EXPECT_EQ(ownState(), kApplicationStateUnknown);
    watch();
    EXPECT_EQ(applications_.frontmostApplicationBundleIdentifier(), std::nullopt);
    {
        X11DisplayLayout service(server_.display());
        EXPECT_EQ(service.createMonitor(0)->currentLayout().elements.size(), 1U);
        X11RenderServer renderServer(server_.display());
        EXPECT_EQ(renderServer.processIdentifierOfContext(1), std::nullopt);
        X11Applications another(server_.display(), device_.bundles);
        another.setUpdateHandler([](const ApplicationInformation&) {});
    }
    server_.thaw();
    client_.createWindow({0, 0, 50, 50}, 0, true);
    EXPECT_TRUE(wasTold("own", kApplicationStateForegroundObscured, false) ||
                wasTold("own", kApplicationStateForeground, true));
}

TEST_F(X11ApplicationsTest, ProgramThatGotTheWindowNumberOfAnotherIsItself) {
    auto first = startOther("60x60+100+100");
    const auto numbers = topLevelWindows();
    const int ended = first->processIdentifier();
    first->signal(SIGKILL);
    first->waitForExit();
    // Nobody asks while there is no window.
    const test::ChildProcess second({"xev", "-display", server_.display(), "-geometry", "60x60+100+100"});
    ASSERT_TRUE(eventually([&] { return topLevelWindows() == numbers; }));
    EXPECT_TRUE(applications_.informationOfProcess(second.processIdentifier()));
    EXPECT_FALSE(applications_.informationOfProcess(ended));
}

TEST_F(X11ApplicationsTest, ApplicationOnAnotherDesktopIsInTheBackground) {
    const test::WindowManager manager(server_.display());
    ASSERT_TRUE(manager.isReady());
    client_.createWindow({0, 0, 50, 50}, 0, true);
    ASSERT_TRUE(eventually([&] { return ownState() == kApplicationStateForeground; }));
    watch();
    test::ChildProcess change({"xdotool", "set_desktop", "1"}, {{"DISPLAY", server_.display()}});
    EXPECT_TRUE(wasTold("own", kApplicationStateBackground, false));
    EXPECT_EQ(applications_.frontmostApplicationBundleIdentifier(), std::nullopt);
    test::ChildProcess back({"xdotool", "set_desktop", "0"}, {{"DISPLAY", server_.display()}});
    EXPECT_TRUE(eventually([&] { return ownState() >= kApplicationStateForeground; }));
}

TEST_F(X11ApplicationsTest, FocusDecidesWhenTheWindowManagerDies) {
    auto manager = std::make_unique<test::WindowManager>(server_.display());
    ASSERT_TRUE(manager->isReady());
    const auto window = client_.createWindow({0, 0, 50, 50}, 0, true);
    ASSERT_TRUE(eventually([&] { return ownState() == kApplicationStateForeground; }));
    manager.reset();
    xcb_set_input_focus(client_.raw(), XCB_INPUT_FOCUS_PARENT, client_.root(), XCB_CURRENT_TIME);
    client_.sync();
    EXPECT_TRUE(eventually([&] { return ownState() == kApplicationStateForegroundObscured; }));
    client_.map(window);
    xcb_set_input_focus(client_.raw(), XCB_INPUT_FOCUS_PARENT, window, XCB_CURRENT_TIME);
    client_.sync();
    EXPECT_TRUE(eventually([&] { return ownState() == kApplicationStateForeground; }));
}

TEST_F(X11ApplicationsTest, DisplayThatIsNotThereHasNoApplications) {
    X11Applications nowhere(":4711", device_.bundles);
    nowhere.setUpdateHandler([](const ApplicationInformation&) {});
    EXPECT_EQ(nowhere.frontmostApplicationBundleIdentifier(), std::nullopt);
}

class LayoutObserver : public DisplayLayoutObserver {
  public:
    void layoutMonitorDidUpdateDisplayLayout(DisplayLayoutMonitor&, const DisplayLayout& layout) override {
        elements = layout.elements.size();
    }
    std::atomic<std::size_t> elements{0};
};

TEST_F(X11ApplicationsTest, LayoutTellsHowManyShareTheScreen) {
    X11DisplayLayout service(server_.display());
    const auto monitor = service.createMonitor(0);
    ASSERT_EQ(monitor->currentLayout().elements.size(), 1U);
    EXPECT_EQ(monitor->currentLayout().elements[0].level, 0);
    const auto observer = std::make_shared<LayoutObserver>();
    monitor->addObserver(observer);
    const auto own = client_.createWindow({0, 0, 200, 300}, 0, true);
    ASSERT_TRUE(eventually([&] { return monitor->currentLayout().elements[0].level == 1; }));
    const auto other = startOther("200x300+200+0");
    EXPECT_TRUE(eventually([&] { return observer->elements == 2; }));
    client_.place(own, {0, 0, 400, 300});
    client_.raise(own);
    EXPECT_TRUE(eventually([&] { return observer->elements == 1; }));
    client_.place(own, {0, 0, 200, 300});
    EXPECT_TRUE(eventually([&] { return observer->elements == 2; }));
    monitor->removeObserver(observer.get());
    other->signal(SIGKILL);
    EXPECT_TRUE(eventually([&] { return monitor->currentLayout().elements.size() == 1; }));
    EXPECT_EQ(observer->elements, 2U);
}

TEST_F(X11ApplicationsTest, LostDisplayIsAnEmptyDesktop) {
    X11DisplayLayout service(server_.display());
    const auto monitor = service.createMonitor(0);
    client_.createWindow({0, 0, 200, 300}, 0, true);
    ASSERT_TRUE(eventually([&] { return monitor->currentLayout().elements[0].level == 1; }));
    server_.kill();
    EXPECT_TRUE(eventually([&] { return monitor->currentLayout().elements[0].level == 0; }));
    EXPECT_EQ(monitor->currentLayout().elements.size(), 1U);
}

TEST_F(X11ApplicationsTest, InvalidatedLayoutMonitorTellsNothing) {
    X11DisplayLayout service(server_.display());
    const auto monitor = service.createMonitor(0);
    const auto observer = std::make_shared<LayoutObserver>();
    monitor->addObserver(observer);
    monitor->invalidate();
    client_.createWindow({0, 0, 200, 300}, 0, true);
    const auto other = startOther("200x300+200+0");
    EXPECT_EQ(observer->elements, 0U);
}

}  // namespace
}  // namespace kelvo::x11
