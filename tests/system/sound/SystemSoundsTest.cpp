#include "SoundFixture.h"
#include "platform/linux/sounds/PulseSystemSounds.h"
#include "support/Eventually.h"
#include "support/TemporaryDirectory.h"

#include <algorithm>
#include <csignal>

namespace kelvo {
namespace {

using namespace std::chrono_literals;

class SystemSoundsTest : public test::SoundFixture {
  protected:
    static constexpr double kLow = 880;
    static constexpr double kHigh = 1320;

    /// How strongly and how long `frequency` is heard in `samples`; a silent one sounds less than 1.
    static double strengthOf(double frequency, const std::vector<SampleBufferRef>& samples) {
        return test::amplitudeIn(samples, frequency) * static_cast<double>(test::soundOf(samples).size()) /
               44100;
    }
    bool hearsBothNotes() {
        return microphone.waitUntil([](const auto& samples) {
            return strengthOf(kLow, samples) > 200 && strengthOf(kHigh, samples) > 200;
        });
    }
    /// What is played by default is heard by the microphone.
    void listen() {
        ASSERT_TRUE(server.start());
        ASSERT_TRUE(server.control("set-default-sink micfeed"));
        startMicrophone();
        ASSERT_FALSE(microphone.next(0.2).empty());
    }
    bool isLogged(const std::string& begin) const {
        return test::eventually([&] {
            const auto lines = log.texts();
            return std::ranges::any_of(lines, [&](const auto& line) { return line.starts_with(begin); });
        });
    }
    std::size_t failures() const {
        const auto lines = log.texts();
        return static_cast<std::size_t>(std::ranges::count_if(
            lines, [](const auto& line) { return line.starts_with("cannot play system sound"); }));
    }

    test::TemporaryDirectory device;
    PulseSystemSounds sounds{std::make_shared<const DeviceRoot>(device.path(), KELVO_RESOURCES)};
};

TEST_F(SystemSoundsTest, BeginningAndEndOfARecordingAreHeard) {
    listen();
    for (const auto sound : {kSystemSoundBeginRecording, kSystemSoundEndRecording}) {
        microphone.clear();
        sounds.playSystemSound(sound);
        EXPECT_TRUE(hearsBothNotes()) << sound;
        microphone.next(0.5);
    }
    EXPECT_EQ(failures(), 0U);
}

TEST_F(SystemSoundsTest, WithoutASoundServerThereIsSilenceAndOneLine) {
    sounds.playSystemSound(kSystemSoundBeginRecording);
    EXPECT_TRUE(isLogged("cannot play system sound 1117: "));
    EXPECT_EQ(failures(), 1U);
}

TEST_F(SystemSoundsTest, SoundThatIsNotThereIsOneLine) {
    ASSERT_TRUE(server.start());
    sounds.playSystemSound(4711);
    EXPECT_TRUE(isLogged("cannot play system sound 4711: "));
    EXPECT_EQ(failures(), 1U);
}

TEST_F(SystemSoundsTest, SoundOfTheDeviceComesFirst) {
    ASSERT_TRUE(server.start());
    device.write("System/Library/Sounds/1117.wav", "noise");
    sounds.playSystemSound(kSystemSoundBeginRecording);
    EXPECT_TRUE(isLogged("cannot play system sound 1117: "));
}

TEST_F(SystemSoundsTest, ServerThatStandsStillHoldsUpNobody) {
    ASSERT_TRUE(server.start());
    ::kill(server.processIdentifier(), SIGSTOP);
    {
        PulseSystemSounds going(std::make_shared<const DeviceRoot>(device.path(), KELVO_RESOURCES));
        going.playSystemSound(kSystemSoundBeginRecording);  // and it goes at once
    }
    EXPECT_EQ(failures(), 0U);
    // One is tried, the next ones wait, and what comes then is refused.
    for (int i = 0; i < 5; ++i)
        sounds.playSystemSound(kSystemSoundBeginRecording);
    EXPECT_EQ(failures(), 1U);
    EXPECT_TRUE(test::eventually([&] { return failures() == 2; })) << "given up after three seconds";
    ::kill(server.processIdentifier(), SIGCONT);
}

}  // namespace
}  // namespace kelvo
