#include "SoundRecordingFixture.h"

#include <cmath>
#include <regex>

namespace kelvo::test {
namespace {

class SoundRecordingTest : public SoundRecordingFixture {
  protected:
    static Wanted withMicrophone(const ClientProcess& client) {
        return {{client.window()}, true, false, false, false};
    }
    /// Records the client's window, with sound all around it; the movie.
    std::string recordWindow(const ClientProcess& client, const StartAnswer& expected) {
        makeSound(client);
        EXPECT_EQ(client.start(withMicrophone(client)), expected) << log();
        pass(3000ms);
        const auto stopped = client.stop();
        EXPECT_TRUE(stopped && !stopped->movie.empty()) << log();
        return stopped ? stopped->movie : "";
    }
    /// The one line that a recording of this kind reported.
    std::string report(const std::string& service) const {
        std::vector<std::string> found;
        const auto read = [&] {
            std::ifstream file(root_.path() + "/private/var/mobile/Library/Logs/kelvod/analytics.jsonl");
            found.clear();
            for (std::string line; std::getline(file, line);)
                if (line.ends_with("}") &&
                    line.find("\"serviceName\":\"" + service + "\"") != std::string::npos)
                    found.push_back(line);
            return !found.empty();
        };
        EXPECT_TRUE(eventually(read, 20s)) << service;
        EXPECT_EQ(found.size(), 1U);
        return found.empty() ? "" : found.front();
    }
    /// The whole number under `key`; -1 when there is none.
    static long numberIn(const std::string& line, const std::string& key) {
        std::smatch found;
        return std::regex_search(line, found, std::regex("\"" + key + "\":(-?[0-9]+)"))
                   ? std::strtol(found[1].str().c_str(), nullptr, 10)
                   : -1;
    }
};

TEST_F(SoundRecordingTest, ScreenMicrophoneAndApplicationAreInTheSavedMovie) {
    const auto client = shell();
    const auto counter = application();
    makeSound(*counter);
    EXPECT_EQ(client->start({{}, true, false, true, false}), (StartAnswer{0, true, false})) << log();
    EXPECT_EQ(client->flag("isRecording"), true);
    EXPECT_EQ(client->flag("isSystemRecording"), true);
    pass(4000ms);
    const auto stopped = client->stop();
    ASSERT_TRUE(stopped && !stopped->movie.empty()) << log();
    EXPECT_EQ(stopped->code, 0);
    EXPECT_GT(countedIn(stopped->movie), 30U);
    EXPECT_EQ(probeStream(stopped->movie, "v:0", "width,height"), "320,480");
    EXPECT_GT(amplitude(stopped->movie, "a:1", kSpoken), kHeard) << "the microphone";
    EXPECT_GT(amplitude(stopped->movie, "a:0", kPlayed), kHeard) << "the application";
    EXPECT_EQ(client->save(stopped->movie), 0) << log();
    ASSERT_EQ(library().size(), 1U);
    EXPECT_GT(countedIn(library().front()), 30U);
    EXPECT_EQ(probeStream(library().front(), "a", "codec_name"), "aac") << "one mixed track";
    EXPECT_TRUE(storeGetsEmpty());
    EXPECT_EQ(client->flag("isRecording"), false);
    EXPECT_THAT(client->told().stops.copy(), IsEmpty()) << "the client's own stop needs no telling";
    const std::string told = report("SystemRecording");
    EXPECT_GE(numberIn(told, "ActiveDuration"), 3);
    EXPECT_GT(numberIn(told, "VideoFrameCount"), 30);
    EXPECT_GT(numberIn(told, "AppAudioFrameCount"), 0);
    EXPECT_GT(numberIn(told, "MicFrameCount"), 0);
    EXPECT_GT(numberIn(told, "RecordedFileSize"), 0);
    EXPECT_EQ(numberIn(told, "VideoCaptureWidth"), 320);
    EXPECT_EQ(numberIn(told, "VideoCaptureHeight"), 480);
    EXPECT_EQ(numberIn(told, "EndReason"), 0);
}

TEST_F(SoundRecordingTest, FullConsentRecordsTheMicrophoneAndTheApplication) {
    const auto client = application();
    const auto accepting = user("alternate");
    const std::string movie = recordWindow(*client, {0, true, false});
    EXPECT_TRUE(logs("user acknowledged recording"));
    EXPECT_GT(countedIn(movie), 20U);
    EXPECT_GT(amplitude(movie, "a:1", kSpoken), kHeard) << "the microphone";
    EXPECT_GT(amplitude(movie, "a:0", kPlayed), kHeard) << "the application";
    EXPECT_LT(amplitude(movie, "a:0", kSpoken), kSilent) << "each on its own track";
    EXPECT_GT(numberIn(report("InAppRecording"), "MicFrameCount"), 0);
    EXPECT_EQ(client->save(movie), 0) << log();
    ASSERT_EQ(library().size(), 1U);
    EXPECT_GT(amplitude(library().front(), "a:0", kSpoken), kHeard / 2) << "mixed";
    EXPECT_GT(amplitude(library().front(), "a:0", kPlayed), kHeard / 2);
    EXPECT_TRUE(storeGetsEmpty());
}

TEST_F(SoundRecordingTest, ConsentWithoutTheMicrophoneRecordsTheApplicationAlone) {
    const auto client = application();
    const auto accepting = user("other");
    const std::string movie = recordWindow(*client, {0, false, false});
    EXPECT_TRUE(logs("user acknowledged recording, but microphone recording is disabled"));
    EXPECT_GT(countedIn(movie), 20U);
    EXPECT_GT(amplitude(movie, "a:0", kPlayed), kHeard) << "the application";
    EXPECT_LT(amplitude(movie, "a:1", kSpoken), kSilent) << "the microphone";
    EXPECT_EQ(numberIn(report("InAppRecording"), "MicFrameCount"), 0);
    EXPECT_TRUE(client->discard(20s));
    expectNothingKept();
}

/// What an application is given of its own sound: the left channel.
std::vector<std::int16_t> soundOf(const std::vector<FakeClientProxy::AudioSample>& samples) {
    std::vector<std::int16_t> sound;
    for (const auto& sample : samples) {
        if (sample.bufferType != SampleBuffer::Type::applicationAudio) continue;
        const auto format = recordFromBytes<AudioFormatRecord>(sample.absdData);
        const bool isBigEndian = (format.formatFlags & kAudioFlagBigEndian) != 0;
        for (std::size_t i = 0; i + 1 < sample.audioData.size(); i += format.bytesPerFrame) {
            const auto high = std::to_integer<unsigned>(sample.audioData[isBigEndian ? i : i + 1]);
            const auto low = std::to_integer<unsigned>(sample.audioData[isBigEndian ? i + 1 : i]);
            sound.push_back(static_cast<std::int16_t>(high << 8 | low));
        }
    }
    return sound;
}

TEST_F(SoundRecordingTest, CaptureBringsTheApplicationsSound) {
    const auto client = application();
    const auto accepting = user("other");
    makeSound(*client);
    Wanted wanted = ownWindow(*client);
    wanted.capture = true;
    ASSERT_EQ(client->start(wanted), (StartAnswer{0, false, false})) << log();
    EXPECT_TRUE(eventually(
        [&] {
            client->told().videoSamples.exchange({});  // lets the frames go
            const auto sound = soundOf(client->told().audioSamples.copy());
            return sound.size() > 44100 && amplitudeOf(kPlayed, std::span(sound).last(11025)) > 4000;
        },
        20s));
    const auto samples = client->told().audioSamples.copy();
    ASSERT_FALSE(samples.empty()) << log();
    const auto format = recordFromBytes<AudioFormatRecord>(samples.front().absdData);
    EXPECT_EQ(format.sampleRate, 44100);
    EXPECT_EQ(format.bitsPerChannel, 16U);
    EXPECT_LT(amplitudeOf(kSpoken, soundOf(samples)), kSilent) << "nobody gave it the microphone";
    const auto stopped = client->stop();
    ASSERT_TRUE(stopped);
    EXPECT_EQ(stopped->movie, "");
    EXPECT_EQ(numberIn(report("InAppCapture"), "RecordedFileSize"), 0);
    expectNothingKept();
}

/// A device whose law asks for a sound, and what its microphone hears of it.
class ShutterSoundTest : public SoundRecordingFixture {
  protected:
    static constexpr double kLow = 880;
    static constexpr double kHigh = 1320;

    void SetUp() override {
        root_.write("etc/kelvod/device.json", R"({"regionalBehaviorShutterClick": true})");
        SoundRecordingFixture::SetUp();
        ASSERT_TRUE(sound_.control("set-default-sink micfeed"));
        heard_ = root_.path() + "/heard";
        listener_ = std::make_unique<ChildProcess>(std::vector<std::string>{
            "sh", "-c", "exec parec --raw --rate=44100 --channels=1 --format=s16le --device=mic >\"$0\"",
            heard_});
        ASSERT_TRUE(eventually([&] { return samplesHeard().size() > 4410; }));
    }

    std::vector<std::int16_t> samplesHeard() const {
        std::ifstream file(heard_, std::ios::binary);
        const std::string bytes{std::istreambuf_iterator<char>(file), {}};
        std::vector<std::int16_t> samples(bytes.size() / 2);
        if (!samples.empty()) std::memcpy(samples.data(), bytes.data(), samples.size() * 2);
        return samples;
    }
    /// Where, from sample `begin` on, the note sounds strongest; none when it does not sound.
    static std::optional<std::size_t> momentOf(double note, const std::vector<std::int16_t>& samples,
                                               std::size_t begin) {
        constexpr std::size_t kPiece = 2205;
        std::optional<std::size_t> moment;
        double strongest = 500;
        for (std::size_t at = begin; at + kPiece <= samples.size(); at += kPiece / 5) {
            const double strength = amplitudeOf(note, std::span(samples).subspan(at, kPiece));
            if (strength <= strongest) continue;
            strongest = strength;
            moment = at;
        }
        return moment;
    }
    /// Waits until both notes were heard since sample `begin`, `first` before `second`.
    bool hears(double first, double second, std::size_t begin) const {
        return eventually(
            [&] {
                const auto samples = samplesHeard();
                const auto firstMoment = momentOf(first, samples, begin);
                const auto secondMoment = momentOf(second, samples, begin);
                return firstMoment && secondMoment && *firstMoment < *secondMoment;
            },
            20s);
    }

    std::string heard_;
    std::unique_ptr<ChildProcess> listener_;
};

TEST_F(ShutterSoundTest, BeginningAndEndOfARecordingOfTheScreenAreHeard) {
    const auto client = shell();
    const auto counter = application();
    const auto accepting = user("other");
    ASSERT_EQ(counter->start(ownWindow(*counter))->code, 0) << log();
    pass(600ms);
    ASSERT_TRUE(counter->stop());
    const std::size_t begin = samplesHeard().size();
    EXPECT_FALSE(momentOf(kLow, samplesHeard(), 0)) << "applications make no sound";
    ASSERT_EQ(client->start(wholeScreen())->code, 0) << log();
    EXPECT_TRUE(hears(kLow, kHigh, begin)) << "upwards";
    pass(600ms);
    const std::size_t end = samplesHeard().size();
    ASSERT_TRUE(client->stop());
    EXPECT_TRUE(hears(kHigh, kLow, end)) << "downwards";
    EXPECT_EQ(timesLogged("cannot play system sound"), 0U);
}

}  // namespace
}  // namespace kelvo::test
