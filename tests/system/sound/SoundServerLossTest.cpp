#include "SoundFixture.h"

#include <algorithm>

namespace kelvo {
namespace {

using namespace std::chrono_literals;
using test::amplitudeIn;

class SoundServerLossTest : public test::SoundFixture {
  protected:
    bool isLogged(const std::string& begin) const {
        const auto lines = log.texts();
        return std::ranges::any_of(lines, [&](const std::string& line) { return line.starts_with(begin); });
    }
};

TEST_F(SoundServerLossTest, RecordingBeginsWithoutAServerAndPicksItUp) {
    std::atomic<int> starts{0};
    manager->setCaptureStartTime(MediaTime::make(0, 1));
    manager->startAppAudioCaptureForProcessID(kProcess, appAudio.collector(), [&] { ++starts; });
    startMicrophone();
    EXPECT_EQ(appAudio.next(0.3).empty(), false) << "silence comes all the same";
    EXPECT_EQ(starts, 1) << "nobody waits for the sound";
    EXPECT_TRUE(isLogged("cannot reach the sound server"));
    EXPECT_TRUE(microphone.all().empty());
    ASSERT_TRUE(server.start());
    const auto player = server.play(440, "speaker", kProcess);
    const auto voice = server.play(1000, "micfeed");
    EXPECT_TRUE(hears(appAudio, 440));
    EXPECT_TRUE(hears(microphone, 1000));
    EXPECT_TRUE(isLogged("connected to the sound server"));
}

TEST_F(SoundServerLossTest, KilledServerCostsOnlyTheTimeItWasAway) {
    ASSERT_TRUE(server.start());
    startTap();
    startMicrophone();
    {
        const auto player = server.play(440, "speaker", kProcess);
        const auto voice = server.play(1000, "micfeed");
        ASSERT_TRUE(hears(appAudio, 440));
        ASSERT_TRUE(hears(microphone, 1000));
        server.kill();
    }
    appAudio.next(0.5);
    EXPECT_LT(amplitudeIn(appAudio.next(0.3), 440), 1);
    EXPECT_TRUE(isLogged("lost the sound server"));
    EXPECT_TRUE(log.contains("KVCaptureManager: MXAudioSessionInterruptionTypeBegan"));
    ASSERT_TRUE(server.start());
    const auto player = server.play(440, "speaker", kProcess);
    const auto voice = server.play(1000, "micfeed");
    EXPECT_TRUE(hears(appAudio, 440));
    EXPECT_TRUE(hears(microphone, 1000));
    EXPECT_LT(test::worstSeam(appAudio.all()), 1e-6) << "the tap's clock never stopped";
    EXPECT_EQ(log.count("gap since last mic tap, filling with empty sample buffer"), 1U);
    EXPECT_LT(test::worstSeam(microphone.all()), 0.25);
}

TEST_F(SoundServerLossTest, StopsWhileTheServerIsAway) {
    startTap();
    startMicrophone();
    appAudio.next(0.2);
    manager->stopAllCapture();
    const std::size_t count = appAudio.all().size();
    ASSERT_TRUE(server.start());
    EXPECT_EQ(appAudio.all().size(), count);
    EXPECT_TRUE(microphone.all().empty());
}

/// Starts and stops at every stage of the connection, while sound plays.
TEST_F(SoundServerLossTest, StartsAndStopsDeliverNothingLate) {
    ASSERT_TRUE(server.start());
    const auto player = server.play(440, "speaker", kProcess);
    const auto voice = server.play(1000, "micfeed");
    std::atomic<bool> mayBeCalled{false};
    std::atomic<int> calls{0};
    std::atomic<int> lateCalls{0};
    const auto output = [&](const SampleBufferRef&) {
        ++calls;
        if (!mayBeCalled) ++lateCalls;
    };
    for (int i = 0; i < 500; ++i) {
        mayBeCalled = true;
        manager->setCaptureStartTime(MediaTime::make(0, 1));
        manager->startMicrophoneCaptureWithOutput(output, nullptr);
        manager->startAppAudioCaptureForProcessID(kProcess, output, nullptr);
        // From none at all to long enough for sound to come.
        std::this_thread::sleep_for(std::chrono::milliseconds(i % 50 == 0 ? 200 : i % 10));
        if (i % 2 == 0) manager->stopMicrophoneCapture();
        manager->stopAllCapture();
        mayBeCalled = false;
    }
    EXPECT_GT(calls, 0);
    EXPECT_EQ(lateCalls, 0);
}

}  // namespace
}  // namespace kelvo
