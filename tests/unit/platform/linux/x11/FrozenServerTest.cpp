#include "platform/linux/x11/X11Applications.h"
#include "platform/linux/x11/X11DisplayLayout.h"
#include "platform/linux/x11/X11RenderServer.h"
#include "platform/linux/x11/X11Screen.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/Eventually.h"
#include "support/FrameRecorder.h"
#include "support/x11/XClient.h"
#include "support/x11/XvfbServer.h"

#include <chrono>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo::x11 {
namespace {

using test::eventually;
using namespace std::chrono_literals;

/// Far above the two seconds that a display is asked for, far below for ever.
constexpr auto kBound = 20s;

/// An X server that runs and takes clients, but does not answer.
class FrozenServerTest : public testing::Test {
  protected:
    FrozenServerTest() { server_.freeze(); }
    ~FrozenServerTest() override {
        server_.thaw();
        EXPECT_LT(std::chrono::steady_clock::now() - begin_, 3 * kBound);
    }

    const std::string& display() const { return server_.display(); }
    void startSource() {
        screen_.setMode(MirroringMode::wholeScreen);
        source_->setDelegate(recorder_);
        source_->startCapture();
    }

    std::chrono::steady_clock::time_point begin_ = std::chrono::steady_clock::now();
    test::XvfbServer server_{200, 160};
    test::XClient client_{server_.display()};
    xcb_window_t window_ = client_.createWindow({0, 0, 100, 100}, 0);
    X11Screen screen_{server_.display()};
    std::shared_ptr<test::FrameRecorder> recorder_ = std::make_shared<test::FrameRecorder>();
    std::shared_ptr<ScreenCaptureSource> source_ = screen_.createSource({200, 160}, MediaTime::make(1, 60));
};

TEST_F(FrozenServerTest, OrientationIsUnknownUntilItGoesOn) {
    EXPECT_EQ(nativeScreenOrientation(display()), std::nullopt);
    server_.thaw();
    EXPECT_TRUE(eventually([&] { return nativeScreenOrientation(display()) == 90.0F; }));
}

TEST_F(FrozenServerTest, SourceStartedMeanwhileStops) {
    startSource();
    std::this_thread::sleep_for(50ms);
    source_->stopCapture();
    EXPECT_TRUE(recorder_->failures().empty());
    EXPECT_EQ(recorder_->count(), 0U);
}

TEST_F(FrozenServerTest, SourceStartedMeanwhileDeliversOnceItGoesOn) {
    startSource();
    std::this_thread::sleep_for(50ms);
    server_.thaw();
    EXPECT_TRUE(eventually([&] { return recorder_->count() > 0; }));
    EXPECT_TRUE(recorder_->failures().empty());
    source_->stopCapture();
}

TEST_F(FrozenServerTest, SourceFollowsNoMirroringButStops) {
    server_.thaw();
    startSource();
    ASSERT_TRUE(eventually([&] { return recorder_->count() > 0; }));
    server_.freeze();
    screen_.setCloneContexts({window_});
    screen_.setMode(MirroringMode::cloneContexts);
    std::this_thread::sleep_for(50ms);
    source_->stopCapture();
    EXPECT_TRUE(recorder_->failures().empty());
}

TEST_F(FrozenServerTest, RenderServerTellsNothingUntilItGoesOn) {
    X11RenderServer renderServer(display());
    EXPECT_EQ(renderServer.processIdentifierOfContext(window_), std::nullopt);
    server_.thaw();
    EXPECT_TRUE(eventually([&] { return renderServer.processIdentifierOfContext(window_) == ::getpid(); }));
    server_.freeze();
    EXPECT_EQ(renderServer.processIdentifierOfContext(window_), std::nullopt);
    server_.thaw();
    EXPECT_TRUE(eventually([&] { return renderServer.processIdentifierOfContext(window_) == ::getpid(); }));
}

TEST_F(FrozenServerTest, ApplicationsAreUnknownUntilItGoesOn) {
    const SimulatedDevice device;
    X11Applications applications(display(), device.bundles);
    EXPECT_EQ(applications.informationOfProcess(::getpid()), std::nullopt);
    server_.thaw();
    client_.createWindow({100, 0, 50, 50}, 0, true);
    EXPECT_TRUE(eventually([&] { return applications.informationOfProcess(::getpid()).has_value(); }));
}

TEST_F(FrozenServerTest, ApplicationsThatAreWatchedMeanwhileAreToldOnceItGoesOn) {
    const SimulatedDevice device;
    X11Applications applications(display(), device.bundles);
    const auto told = std::make_shared<std::atomic<bool>>(false);
    applications.setUpdateHandler([told](const ApplicationInformation& information) {
        if (information.processIdentifier == ::getpid()) *told = true;
    });
    applications.setUpdateHandler([told](const ApplicationInformation& information) {
        if (information.processIdentifier == ::getpid()) *told = true;
    });
    server_.thaw();
    client_.createWindow({100, 0, 50, 50}, 0, true);
    EXPECT_TRUE(eventually([&] { return told->load(); }));
    applications.setUpdateHandler(nullptr);
}

TEST_F(FrozenServerTest, DisplayLayoutIsThatOfAnEmptyDesktop) {
    X11DisplayLayout service(display());
    const auto monitor = service.createMonitor(0);
    ASSERT_EQ(monitor->currentLayout().elements.size(), 1U);
    EXPECT_EQ(monitor->currentLayout().elements.front().level, 0);
}

}  // namespace
}  // namespace kelvo::x11
