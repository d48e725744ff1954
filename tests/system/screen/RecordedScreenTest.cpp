#include "CounterMovie.h"
#include "CounterProgram.h"
#include "HeldUpMoments.h"
#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/media/LavMediaService.h"
#include "platform/linux/system/SystemClock.h"
#include "platform/linux/x11/X11Screen.h"
#include "platform/simulated/SimulatedDevice.h"
#include "session/KVRecordingSession.h"
#include "support/Eventually.h"
#include "support/TemporaryDirectory.h"
#include "support/x11/XClient.h"
#include "support/x11/XvfbServer.h"

#include <algorithm>
#include <future>
#include <map>
#include <thread>

#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

using namespace std::chrono_literals;
using Time = CounterProgram::Time;

constexpr int kWidth = 180;
constexpr int kHeight = 320;
constexpr Time kInterval{1000000000 / 60};
/// How far a frame's time may lie from when its picture was drawn.
constexpr Time kTolerance = 4ms;

/// A counter on a real display, recorded through session, writer and encoder into a movie file.
class RecordedScreen : public testing::Test {
  protected:
    /// Recorded without a pause, its times moved by `offset`.
    struct Stretch {
        Time begin;
        Time end;
        Time offset;
    };

    RecordedScreen() {
        Platform platform = device_.platform();
        platform.clock = std::make_shared<SystemClock>();
        platform.fileSystem = std::make_shared<LinuxFileSystem>(root_);
        platform.media = std::make_shared<LavMediaService>(platform.fileSystem);
        platform.screenCapture = screen_;
        platform.displayMirroring = screen_;
        EXPECT_FALSE(platform.fileSystem->createDirectory(KVTemporaryFileStore::_srTempPath()));
        session_ = std::dynamic_pointer_cast<KVRecordingSession>(
            recordingSessionFactory(platform)("com.example.counter"));
        session_->setWindowSize({kWidth, kHeight});
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
        std::this_thread::sleep_for(50ms);
    }
    /// Lets the recording go on, and notes by how much it has moved its times.
    void record(std::chrono::milliseconds duration) {
        const Time begin = CounterProgram::now();
        std::this_thread::sleep_for(duration);
        stretches_.push_back({begin, CounterProgram::now(), Time(session_->sampleTimeOffset().value)});
    }
    void pause(std::chrono::milliseconds duration) {
        session_->pauseSession();
        std::this_thread::sleep_for(duration);
        session_->resumeSessionWithContextID(counter_.window());
        awaitFirstFrame();
    }
    std::string finish() {
        beginning_ = Time(session_->firstSampleTimestamp().value);
        std::promise<std::optional<URL>> finished;
        session_->finishSessionWithHandler([&](const auto& url, const auto&) { finished.set_value(url); });
        const auto url = finished.get_future().get();
        return url ? root_->hostPath(url->path()) : "";
    }

    /// Holds the movie against what was drawn while recording.
    void checkMovie(const std::vector<CounterFrame>& frames) {
        std::map<std::uint32_t, std::vector<double>> seen;
        std::uint32_t last = 0;
        for (const CounterFrame& frame : frames) {
            if (!frame.number) continue;  // before the first value was drawn
            EXPECT_GE(*frame.number, last) << "out of order";
            last = *frame.number;
            seen[*frame.number].push_back(frame.seconds);
        }
        int checked = 0;
        int late = 0;
        heldUp_.stop();
        const auto drawings = counter_.stop();
        for (std::size_t i = 0; i + 1 < drawings.size(); ++i) {
            const auto& drawing = drawings[i];
            const auto stretch = stretchOf(drawing);
            if (!stretch || drawings[i + 1].done - drawing.done < kInterval) continue;
            if (heldUp_.touch(drawing.begun - 2 * kInterval, drawing.done + 2 * kInterval)) continue;
            ++checked;
            const auto& times = seen[drawing.number];
            EXPECT_EQ(times.size(), 1U) << "value " << drawing.number;
            if (times.size() != 1) continue;
            const Time shown =
                beginning_ + stretch->offset + Time(static_cast<std::int64_t>(times.front() * 1e9));
            EXPECT_GE(shown, drawing.begun - kInterval) << "value " << drawing.number;
            EXPECT_LE(shown, drawing.done + kInterval) << "value " << drawing.number;
            if (shown < drawing.begun - kTolerance || shown > drawing.done + kTolerance) ++late;
        }
        // On a busy machine the server itself draws a frame late now and then.
        EXPECT_LE(late, checked / 20);
        RecordProperty("checked", checked);
        EXPECT_GT(checked, 10);
    }

    /// The stretch of the recording in which the value was drawn and had its turn.
    std::optional<Stretch> stretchOf(const CounterProgram::Drawing& drawing) const {
        const auto found = std::ranges::find_if(stretches_, [&](const Stretch& stretch) {
            return drawing.begun >= stretch.begin && drawing.done + 2 * kInterval <= stretch.end;
        });
        return found == stretches_.end() ? std::nullopt : std::optional(*found);
    }

    SimulatedDevice device_;
    TemporaryDirectory folder_;
    std::shared_ptr<const DeviceRoot> root_ = std::make_shared<const DeviceRoot>(folder_.path(), "");
    XvfbServer server_{kWidth, kHeight};
    std::shared_ptr<x11::X11Screen> screen_ = std::make_shared<x11::X11Screen>(server_.display());
    CounterProgram counter_{server_.display(), kWidth, kHeight};
    HeldUpMoments heldUp_;
    std::shared_ptr<KVRecordingSession> session_;
    std::vector<Stretch> stretches_;
    Time beginning_{0};
};

TEST_F(RecordedScreen, EveryValueOfACounterIsInTheMovieOnceAtItsTimeAndPausesAreCutOut) {
    session_->setSystemRecording(true);
    start();
    record(1500ms);
    pause(700ms);
    const Time firstPause{session_->sampleTimeOffset().value};
    record(1500ms);
    pause(700ms);
    EXPECT_GE(firstPause, 700ms);
    EXPECT_GE(Time(session_->sampleTimeOffset().value), firstPause + 700ms);
    record(1500ms);
    const auto frames = readCounterMovie(finish());
    checkMovie(frames);
    for (std::size_t i = 1; i < frames.size(); ++i)
        EXPECT_LT(frames[i].seconds - frames[i - 1].seconds, 0.4) << "a pause is left in the movie";
}

TEST_F(RecordedScreen, CoveredWindowIsRecordedWithoutAPixelOfItsCover) {
    session_->setContextIDs({counter_.window()});
    XClient other(server_.display());
    const auto cover = other.createWindow({0, 0, kWidth, kHeight}, 0x00FF00);
    other.raise(cover);
    start();
    record(2000ms);
    other.fill(cover, {0, 0, kWidth, kHeight}, 0x00FF00);
    const std::string movie = finish();
    checkMovie(readCounterMovie(movie));
    EXPECT_FALSE(showsGreen(movie));
}

TEST_F(RecordedScreen, DisplayThatStandsStillHoldsUpNeitherPauseNorFinish) {
    session_->setSystemRecording(true);
    start();
    record(500ms);
    server_.freeze();
    std::this_thread::sleep_for(100ms);
    session_->pauseSession();
    session_->resumeSessionWithContextID(counter_.window());
    const auto frames = readCounterMovie(finish());
    server_.thaw();
    EXPECT_GT(frames.size(), 5U);
}

}  // namespace
}  // namespace kelvo::test
