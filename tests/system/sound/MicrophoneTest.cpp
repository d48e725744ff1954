#include "SoundFixture.h"

namespace kelvo {
namespace {

using namespace std::chrono_literals;
using test::amplitudeIn;

class MicrophoneTest : public test::SoundFixture {
  protected:
    void SetUp() override { ASSERT_TRUE(server.start()); }
};

TEST_F(MicrophoneTest, TrackHoldsWhatTheMicrophoneHears) {
    const auto voice = server.play(440, "micfeed");
    const auto application = server.play(1000, "speaker");
    startMicrophone();
    ASSERT_TRUE(hears(microphone, 440));
    EXPECT_TRUE(hearsOnly(microphone, 440, 1000));
    const auto heard = microphone.next(1);
    EXPECT_LT(test::worstSeam(heard), 0.01);  // a buffer that is missing would be 0.02
    const double now = std::chrono::duration<double>(platform.clock->monotonicNow()).count();
    EXPECT_NEAR(heard.back()->presentationTime().seconds(), now, 0.5);
}

TEST_F(MicrophoneTest, SilentMicrophoneYieldsSilenceNotAGap) {
    startMicrophone();
    microphone.next(1);  // what the server says first of its latency is some milliseconds off
    const auto heard = microphone.next(1);
    EXPECT_LT(amplitudeIn(heard, 440), 1);
    EXPECT_LT(test::worstSeam(heard), 0.01);  // a buffer that is missing would be 0.02
}

TEST_F(MicrophoneTest, MicrophoneFollowsTheDefaultSource) {
    const auto voice = server.play(440, "micfeed");
    const auto application = server.play(1000, "speaker");
    startMicrophone();
    ASSERT_TRUE(hears(microphone, 440));
    ASSERT_TRUE(server.control("set-default-source speaker.monitor"));
    EXPECT_TRUE(hears(microphone, 1000));
    microphone.next(0.3);
    EXPECT_LT(amplitudeIn(microphone.next(0.5), 440), 100);
}

TEST_F(MicrophoneTest, SuspendedSourceInterruptsAndTheGapIsFilled) {
    const auto voice = server.play(440, "micfeed");
    startMicrophone();
    ASSERT_TRUE(hears(microphone, 440));
    ASSERT_TRUE(server.control("suspend-source mic 1"));
    for (int i = 0; i < 100 && !manager->isMicInterrupted(); ++i)
        test::ChildProcess({"sleep", "0.05"}).waitForExit();
    EXPECT_TRUE(log.contains("KVCaptureManager: MXAudioSessionInterruptionTypeBegan"));
    test::ChildProcess({"sleep", "0.3"}).waitForExit();
    ASSERT_TRUE(server.control("suspend-source mic 0"));
    ASSERT_TRUE(hears(microphone, 440));
    EXPECT_TRUE(log.contains("KVCaptureManager: MXAudioSessionInterruptionTypeEnded"));
    EXPECT_EQ(log.count("gap since last mic tap, filling with empty sample buffer"), 1U);
    EXPECT_LT(test::worstSeam(microphone.all()), 0.25) << "the gap is filled up to where sound begins again";
}

TEST_F(MicrophoneTest, RemovedSourceIsReplacedByTheNextOne) {
    const auto application = server.play(1000, "speaker");
    startMicrophone();
    microphone.next(0.2);
    ASSERT_TRUE(server.control("unload-module module-remap-source"));
    ASSERT_TRUE(server.control("set-default-source speaker.monitor"));
    EXPECT_TRUE(hears(microphone, 1000));
}

}  // namespace
}  // namespace kelvo
