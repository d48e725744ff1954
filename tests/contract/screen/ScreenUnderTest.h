#pragma once

#include "platform/ScreenCapture.h"
#include "platform/linux/x11/X11Screen.h"
#include "platform/simulated/SimulatedClock.h"
#include "platform/simulated/SimulatedScreen.h"
#include "support/Eventually.h"
#include "support/x11/XClient.h"
#include "support/x11/XvfbServer.h"

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <thread>

#include <gtest/gtest.h>

namespace kelvo::test {

inline constexpr int kScreenWidth = 160;
inline constexpr int kScreenHeight = 240;

/// A screen of 160 by 240 pixels whose pictures a test makes: what the contract needs of each implementation.
class ScreenUnderTest {
  public:
    virtual ~ScreenUnderTest() = default;

    virtual ScreenCaptureService& service() = 0;
    virtual DisplayMirroring& mirroring() = 0;
    /// Draws the numbered picture over the whole screen.
    virtual void show(std::uint32_t number) = 0;
    virtual void resize(int width, int height) = 0;
    /// Lets time pass.
    virtual void wait(std::chrono::milliseconds time) = 0;
    /// Takes the display away under a running source.
    virtual void die() = 0;
    virtual std::chrono::nanoseconds now() = 0;

    /// Waits until something that must come has come.
    virtual bool eventually(const std::function<bool()>& condition) = 0;
};

class SimulatedScreenUnderTest : public ScreenUnderTest {
  public:
    SimulatedScreenUnderTest() { screen_.resize({kScreenWidth, kScreenHeight}); }

    ScreenCaptureService& service() override { return screen_; }
    DisplayMirroring& mirroring() override { return screen_; }
    void show(std::uint32_t number) override { screen_.show(number); }
    void resize(int width, int height) override {
        screen_.resize({static_cast<double>(width), static_cast<double>(height)});
    }
    void wait(std::chrono::milliseconds time) override {
        for (; time.count() > 0; time -= std::chrono::milliseconds(1)) {
            clock_->advance(std::chrono::milliseconds(1));
            screen_.catchUp();
        }
    }
    void die() override { screen_.fail(ScreenCaptureStatus::lost); }
    std::chrono::nanoseconds now() override { return clock_->monotonicNow(); }
    bool eventually(const std::function<bool()>& condition) override {
        for (int i = 0; i < 1000 && !condition(); ++i)
            wait(std::chrono::milliseconds(1));
        return condition();
    }

  private:
    const std::shared_ptr<SimulatedClock> clock_ = std::make_shared<SimulatedClock>();
    SimulatedScreen screen_{clock_};
};

class X11ScreenUnderTest : public ScreenUnderTest {
  public:
    X11ScreenUnderTest() { EXPECT_TRUE(client_.resizeScreen(kScreenWidth, kScreenHeight)); }

    ScreenCaptureService& service() override { return screen_; }
    DisplayMirroring& mirroring() override { return screen_; }
    void show(std::uint32_t number) override { client_.showNumber(window_, number); }
    void resize(int width, int height) override {
        ASSERT_TRUE(client_.resizeScreen(width, height));
        client_.place(window_, {0, 0, width, height});
    }
    void wait(std::chrono::milliseconds time) override { std::this_thread::sleep_for(time); }
    void die() override { server_.kill(); }
    std::chrono::nanoseconds now() override { return std::chrono::steady_clock::now().time_since_epoch(); }
    bool eventually(const std::function<bool()>& condition) override { return test::eventually(condition); }

  private:
    XvfbServer server_{kScreenHeight, kScreenHeight};
    XClient client_{server_.display()};
    x11::X11Screen screen_{server_.display()};
    xcb_window_t window_ = client_.createWindow({0, 0, kScreenWidth, kScreenHeight}, 0);
};

}  // namespace kelvo::test
