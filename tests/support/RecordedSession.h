#pragma once

#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/media/LavMediaService.h"
#include "platform/linux/system/SystemClock.h"
#include "platform/linux/x11/X11Screen.h"
#include "platform/simulated/SimulatedDevice.h"
#include "session/KVRecordingSession.h"
#include "support/Eventually.h"
#include "support/HeldUpMoments.h"
#include "support/TemporaryDirectory.h"
#include "support/x11/XvfbServer.h"

#include <algorithm>
#include <chrono>
#include <future>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {

/// A recording of a real display through session, writer and encoder into a movie file, for a test that holds
/// the movie against what it knows of the display. Header only: its user links what it includes.
class RecordedSession : public testing::Test {
  protected:
    using Time = std::chrono::nanoseconds;  ///< on the host's monotonic clock

    /// Recorded without a pause, its times moved by `offset`.
    struct Stretch {
        Time begin;
        Time end;
        Time offset;
    };

    static Time now() { return std::chrono::steady_clock::now().time_since_epoch(); }

    /// With the sound of `audio`; without, with the simulated device's. The display can be resized up to
    /// `largestSide` either way.
    RecordedSession(int width, int height, std::shared_ptr<AudioService> audio = nullptr, int largestSide = 0)
        : server_(std::max(width, largestSide), std::max(height, largestSide)),
          screen_(std::make_shared<x11::X11Screen>(server_.display())) {
        Platform platform = device_.platform();
        platform.clock = std::make_shared<SystemClock>();
        platform.fileSystem = std::make_shared<LinuxFileSystem>(root_);
        platform.media = std::make_shared<LavMediaService>(platform.fileSystem);
        platform.screenCapture = screen_;
        platform.displayMirroring = screen_;
        if (audio) platform.audio = std::move(audio);
        EXPECT_FALSE(platform.fileSystem->createDirectory(KVTemporaryFileStore::_srTempPath()));
        session_ = std::dynamic_pointer_cast<KVRecordingSession>(
            recordingSessionFactory(platform)("com.example.recorded"));
        session_->setWindowSize({static_cast<double>(width), static_cast<double>(height)});
    }

    void start() {
        session_->setRecording(true);
        std::promise<void> started;
        session_->startSessionWithHandler([&] { started.set_value(); });
        started.get_future().wait();
        awaitFirstFrame();
    }
    void awaitFirstFrame() {
        EXPECT_TRUE(eventually(
            [this] { return !session_->sessionWasResumed() && !session_->firstSampleTimestamp().isZero(); }));
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
    }
    /// Lets the recording go on, and notes by how much it has moved its times.
    void record(std::chrono::milliseconds duration) {
        const Time begin = now();
        std::this_thread::sleep_for(duration);
        stretches_.push_back({begin, now(), Time(session_->sampleTimeOffset().value)});
    }
    /// The context is what a recording of windows goes on with.
    void pause(std::chrono::milliseconds duration, std::uint32_t contextID) {
        session_->pauseSession();
        std::this_thread::sleep_for(duration);
        session_->resumeSessionWithContextID(contextID);
        awaitFirstFrame();
    }
    /// Where the movie lies; empty when there is none.
    std::string finish() {
        beginning_ = Time(session_->firstSampleTimestamp().value);
        std::promise<std::optional<URL>> finished;
        session_->finishSessionWithHandler([&](const auto& url, const auto&) { finished.set_value(url); });
        const auto url = finished.get_future().get();
        return url ? root_->hostPath(url->path()) : "";
    }

    /// The stretch of the recording that holds everything from `begin` to `end`.
    std::optional<Stretch> stretchOf(Time begin, Time end) const {
        const auto found = std::ranges::find_if(
            stretches_, [&](const Stretch& stretch) { return begin >= stretch.begin && end <= stretch.end; });
        return found == stretches_.end() ? std::nullopt : std::optional(*found);
    }

    SimulatedDevice device_;
    TemporaryDirectory folder_;
    std::shared_ptr<const DeviceRoot> root_ = std::make_shared<const DeviceRoot>(folder_.path(), "");
    XvfbServer server_;
    std::shared_ptr<x11::X11Screen> screen_;
    HeldUpMoments heldUp_;
    std::shared_ptr<KVRecordingSession> session_;
    std::vector<Stretch> stretches_;
    Time beginning_{0};
};

}  // namespace kelvo::test
