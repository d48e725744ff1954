#include "SoundFixture.h"

namespace kelvo::test {
namespace {

/// The same client against the server with which PipeWire speaks PulseAudio's protocol.
class PipeWireTest : public SoundFixture {
  protected:
    /// It makes two channels of one and one of two, and some gets louder by that.
    static constexpr double kLoudness = 0.5;

    PipeWireTest() : SoundFixture(SoundServer::Kind::pipeWire) {}

    void SetUp() override {
        if (!SoundServer::hasPipeWire()) GTEST_SKIP() << "PipeWire is not installed";
        ASSERT_TRUE(server.start());
    }
};

TEST_F(PipeWireTest, TapHoldsItsProcessAndNotItsNeighbour) {
    const auto own = server.play(440, "speaker", kProcess);
    const auto neighbour = server.play(1000, "speaker", kNeighbour);
    startTap();
    ASSERT_TRUE(hears(appAudio, 440));
    EXPECT_TRUE(hearsOnly(appAudio, 440, 1000, kLoudness));
}

TEST_F(PipeWireTest, TapFollowsStreamsThatEndAndComeAgain) {
    startTap();
    {
        const auto player = server.play(440, "speaker", kProcess);
        ASSERT_TRUE(hears(appAudio, 440));
    }
    const auto player = server.play(1000, "speaker", kProcess);
    EXPECT_TRUE(hears(appAudio, 1000));
    EXPECT_LT(worstSeam(appAudio.all()), 1e-6);
}

TEST_F(PipeWireTest, TrackHoldsWhatTheMicrophoneHears) {
    const auto voice = server.play(440, "micfeed");
    const auto application = server.play(1000, "speaker");
    startMicrophone();
    ASSERT_TRUE(hears(microphone, 440));
    EXPECT_TRUE(hearsOnly(microphone, 440, 1000, kLoudness));
    const auto heard = microphone.next(0.2);
    const double now = std::chrono::duration<double>(platform.clock->monotonicNow()).count();
    EXPECT_NEAR(heard.back()->presentationTime().seconds(), now, 0.5);
}

TEST_F(PipeWireTest, ServerThatComesBackIsPickedUp) {
    startTap();
    startMicrophone();
    {
        const auto player = server.play(440, "speaker", kProcess);
        const auto voice = server.play(440, "micfeed");
        ASSERT_TRUE(hears(appAudio, 440));
        ASSERT_TRUE(hears(microphone, 440));
        server.kill();
    }
    ASSERT_TRUE(server.start());
    const auto player = server.play(1000, "speaker", kProcess);
    const auto voice = server.play(1000, "micfeed");
    EXPECT_TRUE(hears(appAudio, 1000));
    EXPECT_TRUE(hears(microphone, 1000));
    EXPECT_LT(worstSeam(appAudio.all()), 1e-6);
}

}  // namespace
}  // namespace kelvo::test
