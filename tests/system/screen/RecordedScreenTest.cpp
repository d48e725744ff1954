#include "CounterMovie.h"
#include "CounterProgram.h"
#include "support/RecordedSession.h"
#include "support/x11/XClient.h"

#include <map>

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

/// A counter on a real display, recorded into a movie file.
class RecordedScreen : public RecordedSession {
  protected:
    /// With room for the screen to turn.
    RecordedScreen() : RecordedSession(kWidth, kHeight, nullptr, kHeight) {}

    void pause(std::chrono::milliseconds duration) { RecordedSession::pause(duration, counter_.window()); }

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
            const auto stretch = stretchOf(drawing.begun, drawing.done + 2 * kInterval);
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

    XClient client_{server_.display()};
    const bool isUpright_ = client_.resizeScreen(kWidth, kHeight);
    CounterProgram counter_{server_.display(), kWidth, kHeight};
};

std::vector<std::uint32_t> numbersOf(const std::vector<CounterFrame>& frames) {
    std::vector<std::uint32_t> numbers;
    for (const CounterFrame& frame : frames) {
        if (frame.number) numbers.push_back(*frame.number);
    }
    return numbers;
}

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

TEST_F(RecordedScreen, ScreenThatTurnsStaysWholeInTheMovie) {
    ASSERT_TRUE(isUpright_);
    session_->setSystemRecording(true);
    start();
    record(500ms);
    ASSERT_TRUE(client_.resizeScreen(kHeight, kWidth));
    client_.place(counter_.window(), {0, 0, kHeight, kWidth});
    record(1000ms);
    const std::string movie = finish();
    // The screen that lies across fills the width of the upright movie and leaves the rest black.
    const auto upright = numbersOf(readCounterMovie(movie));
    const auto lying = numbersOf(readCounterMovie(movie, "180:102:0:109"));
    ASSERT_FALSE(upright.empty());
    ASSERT_FALSE(lying.empty());
    EXPECT_LT(upright.back(), lying.back());
    EXPECT_GE(lying.size(), 20U);
    EXPECT_TRUE(std::ranges::is_sorted(lying));
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
