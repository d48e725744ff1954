#include "KelvoctlProcess.h"
#include "support/Tones.h"
#include "support/daemon/DaemonWorld.h"
#include "support/media/MovieProbe.h"
#include "support/x11/XClient.h"

#include <algorithm>
#include <atomic>
#include <cmath>
#include <csignal>
#include <filesystem>
#include <thread>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using namespace std::chrono_literals;
using test::KelvoctlProcess;

constexpr int kMicrophoneTone = 440;
constexpr int kApplicationTone = 880;
constexpr double kHalfOfFullScale = 16384;
/// Of what was played; mixing and coding take some.
constexpr double kHeard = 0.15;

/// The application in front: a managed window that is painted anew thirty times a second, red first, then
/// ever bluer.
class Painter {
  public:
    explicit Painter(const std::string& display) : client_(display) {
        window_ = client_.createWindow({0, 0, test::DaemonWorld::kWidth, test::DaemonWorld::kHeight},
                                       0xff0000, true);
        thread_ = std::thread([this] {
            for (std::uint32_t blue = 0; !isOver_; blue = std::min(blue + 1, 255U)) {
                client_.fill(window_, {0, 0, test::DaemonWorld::kWidth, test::DaemonWorld::kHeight},
                             0xff0000U | blue);
                std::this_thread::sleep_for(33ms);
            }
        });
    }
    ~Painter() {
        isOver_ = true;
        thread_.join();
    }
    Painter(const Painter&) = delete;
    Painter& operator=(const Painter&) = delete;

  private:
    test::XClient client_;
    xcb_window_t window_ = 0;
    std::atomic<bool> isOver_ = false;
    std::thread thread_;
};

/// How loud a tone is in a movie, against what was played: the median of quarters of a second, so that
/// neither the silence before a capture has begun nor a gap of a busy machine counts.
double loudness(const std::string& movie, const std::string& stream, double frequency) {
    constexpr std::size_t kPiece = 44100 / 4;
    const std::vector<float> sound = test::decodedSound(movie, stream);
    std::vector<std::int16_t> samples(sound.size());
    std::ranges::transform(sound, samples.begin(), [](float each) {
        return static_cast<std::int16_t>(std::lround(std::clamp(each, -1.0F, 1.0F) * 32767));
    });
    std::vector<double> pieces;
    for (std::size_t at = 0; at + kPiece <= samples.size(); at += kPiece)
        pieces.push_back(test::amplitudeOf(frequency, std::span(samples).subspan(at, kPiece)));
    if (pieces.empty()) return 0;
    std::ranges::nth_element(pieces, pieces.begin() + static_cast<std::ptrdiff_t>(pieces.size() / 2));
    return pieces[pieces.size() / 2] / kHalfOfFullScale;
}

/// kelvoctl, the daemon, a screen and a sound server, all of them real.
class RecordingTest : public testing::Test {
  protected:
    void SetUp() override {
        ASSERT_TRUE(world.isUp()) << world.log();
        painter = std::make_unique<Painter>(world.display());
    }

    /// Both are named by this process, whose window is in front.
    void playTones() {
        microphone = world.sound().play(kMicrophoneTone, "micfeed");
        application = world.sound().play(kApplicationTone, "speaker", ::getpid());
    }

    std::unique_ptr<KelvoctlProcess> begin(std::vector<std::string> arguments) {
        arguments.insert(arguments.begin(), "record");
        return std::make_unique<KelvoctlProcess>(world.socket(), arguments, KELVOCTL_PROGRAM,
                                                 world.display());
    }
    std::pair<int, std::string> run(const std::vector<std::string>& arguments) {
        return KelvoctlProcess::run(world.socket(), arguments);
    }

    /// The one movie of the library, and nothing left elsewhere.
    std::string savedMovie() {
        EXPECT_EQ(world.library().size(), 1U) << world.log();
        EXPECT_TRUE(test::eventually([this] { return world.store().empty(); }));
        return world.library().empty() ? "" : world.library().front();
    }
    static void expectWhole(const std::string& movie, double least, double most) {
        EXPECT_EQ(test::decodingComplaints(movie), "");
        const double seconds = std::stod(test::probeFormat(movie, "duration"));
        EXPECT_GE(seconds, least);
        EXPECT_LE(seconds, most);
        EXPECT_EQ(test::probeStream(movie, "v:0", "width"), std::to_string(test::DaemonWorld::kWidth));
        EXPECT_EQ(test::probeStream(movie, "v:0", "height"), std::to_string(test::DaemonWorld::kHeight));
    }

    test::DaemonWorld world;
    std::unique_ptr<Painter> painter;
    std::unique_ptr<test::ChildProcess> microphone;
    std::unique_ptr<test::ChildProcess> application;
};

TEST_F(RecordingTest, ScreenAndBothSoundsAreInTheSavedMovie) {
    playTones();
    const auto recording = begin({"--seconds", "4", "--microphone"});
    EXPECT_EQ(recording->waitForEnd(), 0) << recording->output() << world.log();
    EXPECT_NE(recording->output().find("saved 4."), std::string::npos) << recording->output();
    const std::string movie = savedMovie();
    expectWhole(movie, 1, 15);
    const auto picture = test::decodedPicture(movie, 1);
    ASSERT_EQ(picture.size(), 3U * test::DaemonWorld::kWidth * test::DaemonWorld::kHeight);
    const std::size_t pixel = 3U * (test::DaemonWorld::kWidth * 120 + 70);  // far from the pointer
    EXPECT_GT(picture[pixel], 200);                                         // red
    EXPECT_LT(picture[pixel + 1], 60);                                      // not green
    EXPECT_EQ(test::probeStream(movie, "a:1", "index"), "");
    EXPECT_GT(loudness(movie, "a:0", kMicrophoneTone), kHeard);
    EXPECT_GT(loudness(movie, "a:0", kApplicationTone), kHeard);
}

TEST_F(RecordingTest, OutputKeepsTheSoundsApartAndLeavesTheLibraryEmpty) {
    playTones();
    const std::string movie = world.root() + "/talk.mp4";
    const auto recording = begin({"--seconds", "4", "--microphone", "--output", movie});
    EXPECT_EQ(recording->waitForEnd(), 0) << recording->output() << world.log();
    EXPECT_TRUE(world.library().empty());
    EXPECT_TRUE(test::eventually([this] { return world.store().empty(); }));
    expectWhole(movie, 1, 15);
    const double first = loudness(movie, "a:0", kMicrophoneTone);
    const double second = loudness(movie, "a:1", kMicrophoneTone);
    EXPECT_GT(std::max(first, second), kHeard);
    EXPECT_LT(std::min(first, second), 0.05);
    const std::string others = first < second ? "a:0" : "a:1";
    EXPECT_GT(loudness(movie, others, kApplicationTone), kHeard);
}

TEST_F(RecordingTest, CtrlCStopsAndSaves) {
    const auto recording = begin({});
    ASSERT_TRUE(recording->waitForLine("recording")) << world.log();
    std::this_thread::sleep_for(1s);
    recording->signal(SIGINT);
    EXPECT_EQ(recording->waitForEnd(), 0) << recording->output();
    EXPECT_NE(recording->output().find(" to the library\n"), std::string::npos) << recording->output();
    expectWhole(savedMovie(), 0, 15);
}

TEST_F(RecordingTest, StopFromAnotherTerminalEndsTheRecording) {
    const auto recording = begin({});
    ASSERT_TRUE(recording->waitForLine("recording")) << world.log();
    EXPECT_EQ(run({"status"}),
              std::pair(0, std::string("recording the whole screen, without the microphone\n")));
    std::this_thread::sleep_for(500ms);
    EXPECT_EQ(run({"stop"}),
              std::pair(0, std::string(
                               "saving; this takes a while after a long recording\nsaved to the library\n")))
        << world.log();
    EXPECT_EQ(recording->waitForEnd(), 0);
    EXPECT_NE(recording->output().find("the recording was stopped from elsewhere\n"), std::string::npos);
    expectWhole(savedMovie(), 0, 15);
    EXPECT_EQ(run({"status"}), std::pair(0, std::string("nothing is being recorded\n")));
}

TEST_F(RecordingTest, WhatARunningRecordingDoesNotTakeIsSaid) {
    const auto recording = begin({"--json"});
    ASSERT_TRUE(recording->waitForLine(R"({"recording":true,"microphone":false})")) << world.log();
    EXPECT_EQ(run({"record"}).first, 4);
    EXPECT_EQ(run({"pause"}), std::pair(1, std::string("kelvoctl: the daemon does not pause a recording of "
                                                       "the whole screen; it goes on\n")));
    EXPECT_EQ(run({"resume"}).first, 1);
    recording->signal(SIGTERM);
    EXPECT_EQ(recording->waitForEnd(), 0);
    EXPECT_NE(recording->output().find(R"({"saved":"library","seconds":)"), std::string::npos)
        << recording->output();
}

TEST_F(RecordingTest, RecordersFollowOneAnother) {
    for (int round = 1; round <= 3; ++round) {
        const auto recording = begin({"--seconds", "0.5"});
        EXPECT_EQ(recording->waitForEnd(), 0) << recording->output() << world.log();
        EXPECT_EQ(world.library().size(), static_cast<std::size_t>(round));
    }
    EXPECT_TRUE(test::eventually([this] { return world.store().empty(); }));
}

}  // namespace
}  // namespace kelvo
