#include "SoundFixture.h"

#include <cstdlib>
#include <pulse/simple.h>
#include <thread>

namespace kelvo {
namespace {

using namespace std::chrono_literals;
using test::amplitudeIn;

class ApplicationTapTest : public test::SoundFixture {
  protected:
    void SetUp() override { ASSERT_TRUE(server.start()); }
};

TEST_F(ApplicationTapTest, TapHoldsItsProcessAndNotItsNeighbour) {
    const auto own = server.play(440, "speaker");
    const auto neighbour = server.play(1000, "speaker");
    startTap(own->processIdentifier());
    ASSERT_TRUE(hears(appAudio, 440));
    EXPECT_TRUE(hearsOnly(appAudio, 440, 1000));
}

TEST_F(ApplicationTapTest, TapMixesAllStreamsOfItsProcess) {
    startTap();
    const auto first = server.play(440, "speaker", kProcess);
    const auto second = server.play(1000, "speaker", kProcess);
    const auto elsewhere = server.play(1700, "micfeed", kProcess);
    bool isComplete = false;
    for (int attempt = 0; attempt < 40 && !isComplete; ++attempt) {
        const auto heard = appAudio.next(0.25);
        // Three tones clip now and then, which costs each a little.
        isComplete = amplitudeIn(heard, 440) > kPlayed * 0.7 && amplitudeIn(heard, 1000) > kPlayed * 0.7 &&
                     amplitudeIn(heard, 1700) > kPlayed * 0.7;
    }
    EXPECT_TRUE(isComplete);
}

TEST_F(ApplicationTapTest, TapFollowsAStreamThatMovesToAnotherSink) {
    const auto player = server.play(440, "speaker", kProcess);
    startTap();
    ASSERT_TRUE(hears(appAudio, 440));
    const std::string index = server.answer("list short sink-inputs");
    ASSERT_TRUE(server.control("move-sink-input " + std::to_string(std::atoi(index.c_str())) + " micfeed"));
    appAudio.next(0.5);
    EXPECT_TRUE(hears(appAudio, 440));
}

TEST_F(ApplicationTapTest, TapFollowsStreamsThatEndAndComeAgain) {
    startTap();
    EXPECT_LT(amplitudeIn(appAudio.next(0.3), 440), 1);
    {
        const auto player = server.play(440, "speaker", kProcess);
        ASSERT_TRUE(hears(appAudio, 440));
    }
    appAudio.next(0.5);
    EXPECT_LT(amplitudeIn(appAudio.next(0.3), 440), 1);
    const auto player = server.play(440, "speaker", kProcess);
    EXPECT_TRUE(hears(appAudio, 440));
}

TEST_F(ApplicationTapTest, QuietProcessYieldsSilenceOnTime) {
    startTap();
    const auto heard = appAudio.next(1);
    const double now = std::chrono::duration<double>(platform.clock->monotonicNow()).count();
    const auto end = heard.back()->presentationTime() + heard.back()->duration();
    EXPECT_NEAR(end.seconds(), now, 0.5);
    EXPECT_LT(test::worstSeam(heard), 1e-6);
    for (const std::int16_t sample : test::soundOf(heard))
        ASSERT_EQ(sample, 0);
}

TEST_F(ApplicationTapTest, BuffersLastUntilAFirstFrameThatComesLate) {
    manager->startAppAudioCaptureForProcessID(kProcess, appAudio.collector(), nullptr);
    std::this_thread::sleep_for(1500ms);  // each of the ten is dropped that is full meanwhile
    EXPECT_TRUE(appAudio.all().empty());
    manager->setCaptureStartTime(MediaTime::make(0, 1));
    EXPECT_FALSE(appAudio.next(0.5).empty());
}

TEST_F(ApplicationTapTest, TapFollowsTheClockWhileStreamsComeAndGo) {
    startTap();
    for (int i = 0; i < 3; ++i) {
        const auto player = server.play(440, "speaker", kProcess);
        appAudio.next(0.4);
    }
    EXPECT_LT(test::worstSeam(appAudio.all()), 1e-6);
}

/// Plays a beep and says when the server says that it will be heard.
class Beeper {
  public:
    static constexpr int kRate = 44100;

    Beeper() {
        const pa_sample_spec spec{PA_SAMPLE_S16NE, kRate, 1};
        const pa_buffer_attr attributes{kWhatever, kRate / 10, kWhatever, kWhatever, kWhatever};
        player_ = pa_simple_new(nullptr, "beeper", PA_STREAM_PLAYBACK, "speaker", "beep", &spec, nullptr,
                                &attributes, nullptr);
    }
    ~Beeper() {
        if (player_ != nullptr) pa_simple_free(player_);
    }
    Beeper(const Beeper&) = delete;
    Beeper& operator=(const Beeper&) = delete;

    bool isConnected() const { return player_ != nullptr; }
    void beQuiet(int milliseconds) { write(milliseconds, 0); }
    /// The moment at which the beep begins, in seconds of the monotonic clock.
    double beep(const Clock& clock) {
        int error = 0;
        const pa_usec_t latency = pa_simple_get_latency(player_, &error);
        const auto begin = clock.monotonicNow() + std::chrono::microseconds(latency);
        write(100, 20000);
        return std::chrono::duration<double>(begin).count();
    }

  private:
    static constexpr auto kWhatever = static_cast<std::uint32_t>(-1);

    void write(int milliseconds, std::int16_t loudness) {
        std::vector<std::int16_t> samples(static_cast<std::size_t>(kRate) * milliseconds / 1000);
        for (std::size_t i = 0; i < samples.size(); ++i)
            samples[i] = (i / 22) % 2 == 0 ? loudness : static_cast<std::int16_t>(-loudness);
        int error = 0;
        pa_simple_write(player_, samples.data(), samples.size() * sizeof(std::int16_t), &error);
    }

    pa_simple* player_ = nullptr;
};

/// When the beeps in `samples` begin.
std::vector<double> onsets(const std::vector<SampleBufferRef>& samples) {
    std::vector<double> moments;
    double quietSince = 0;
    for (const SampleBufferRef& sample : samples) {
        const auto sound = test::soundOf({sample});
        for (std::size_t i = 0; i < sound.size(); ++i) {
            const double moment = sample->presentationTime().seconds() + static_cast<double>(i) / 44100;
            if (std::abs(sound[i]) < 5000) continue;
            if (moment - quietSince > 0.1) moments.push_back(moment);
            quietSince = moment;
        }
    }
    return moments;
}

TEST_F(ApplicationTapTest, SoundCarriesTheMomentAtWhichItWasPlayed) {
    startTap(::getpid());
    Beeper beeper;
    ASSERT_TRUE(beeper.isConnected());
    std::vector<double> played;
    beeper.beQuiet(500);
    for (int i = 0; i < 5; ++i) {
        played.push_back(beeper.beep(*platform.clock));
        beeper.beQuiet(400);
    }
    ASSERT_TRUE(appAudio.waitUntil([&](const auto& samples) { return onsets(samples).size() >= 5; }));
    const auto heard = onsets(appAudio.all());
    ASSERT_EQ(heard.size(), played.size());
    for (std::size_t i = 0; i < played.size(); ++i)
        EXPECT_NEAR(heard[i], played[i], 0.015) << "beep " << i;
}

}  // namespace
}  // namespace kelvo
