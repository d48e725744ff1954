#include "SoundtrackFixture.h"
#include "support/Tones.h"

#include <cmath>

namespace kelvo::test {
namespace {

constexpr double kRate = 44100;
/// A tone that is there is louder than this, half of full scale being what is played; one that is not there,
/// quieter than the other bound.
constexpr double kHeard = 0.2;
constexpr double kUnheard = 0.02;

/// How loud a tone is within a track, from 0 to 1.
class TrackSound {
  public:
    TrackSound(const std::string& movie, const std::string& stream) : sound_(decodedSound(movie, stream)) {}

    double seconds() const { return static_cast<double>(sound_.size()) / kRate; }
    double level(double hertz, double from, double to) const {
        std::vector<std::int16_t> part;
        const auto last = std::min(sound_.size(), static_cast<std::size_t>(std::max(to, 0.0) * kRate));
        for (auto i = static_cast<std::size_t>(std::max(from, 0.0) * kRate); i < last; ++i)
            part.push_back(static_cast<std::int16_t>(std::lround(sound_[i] * 32000)));
        return part.empty() ? 0 : amplitudeOf(hertz, part) / 32000;
    }
    /// The loudest that any sample is.
    double peak(double from, double to) const {
        double peak = 0;
        const auto last = std::min(sound_.size(), static_cast<std::size_t>(to * kRate));
        for (auto i = static_cast<std::size_t>(from * kRate); i < last; ++i)
            peak = std::max(peak, std::abs(static_cast<double>(sound_[i])));
        return peak;
    }
    /// How long a tone is away, at the longest, in steps of 50 ms.
    double longestAbsence(double hertz, double from, double to) const {
        constexpr double kStepLength = 0.05;
        double longest = 0;
        double absence = 0;
        for (double time = from; time + kStepLength <= to; time += kStepLength) {
            absence = level(hertz, time, time + kStepLength) < kHeard ? absence + kStepLength : 0;
            longest = std::max(longest, absence);
        }
        return longest;
    }

  private:
    const std::vector<float> sound_;
};

class InterruptionsTest : public SoundtrackFixture {
  protected:
    double movieTime(Time moment) const { return std::chrono::duration<double>(moment - beginning_).count(); }

    /// Whether the frames of a track of sound follow one another without a hole.
    static void expectWholeTrack(const std::string& movie, const std::string& stream) {
        const auto times = frameTimes(movie, stream);
        ASSERT_GT(times.size(), 10U);
        for (std::size_t i = 1; i < times.size(); ++i)
            EXPECT_NEAR(times[i] - times[i - 1], 1024 / kRate, 0.001) << stream << " at " << times[i];
    }
};

TEST_F(InterruptionsTest, SwitchedOffMicrophoneIsSilenceInTheMovieAndNotAGap) {
    const auto program = startFlashing(300ms);
    const auto voice = sound_.play(440, "micfeed");
    start();
    record(1500ms);
    session_->setMicrophoneEnabled(false);
    const Time off = now();
    record(1500ms);
    const Time on = now();
    session_->setMicrophoneEnabled(true);
    record(1500ms);
    const Time end = now();
    const std::string movie = finish();
    EXPECT_EQ(decodingComplaints(movie), "");
    expectWholeTrack(movie, "a:1");
    const TrackSound microphone(movie, "a:1");
    // What was on its way when the microphone was switched is on either side.
    EXPECT_GT(microphone.level(440, movieTime(off) - 0.7, movieTime(off) - 0.3), kHeard);
    EXPECT_LT(microphone.peak(movieTime(off) + 0.1, movieTime(on) - 0.5), 0.001);
    EXPECT_GT(microphone.level(440, movieTime(on) + 0.3, movieTime(on) + 0.8), kHeard);
    EXPECT_NEAR(microphone.seconds(), movieTime(end), 0.5);
}

TEST_F(InterruptionsTest, KilledSoundServerCostsTheMovieOnlyTheTimeItWasAwayAndNoStep) {
    auto program = startFlashing(300ms);
    auto voice = sound_.play(440, "micfeed");
    start();
    record(2000ms);
    const Time killed = now();
    sound_.kill();
    auto flashes = program->stop();
    voice.reset();
    std::this_thread::sleep_for(700ms);
    ASSERT_TRUE(sound_.start());
    voice = sound_.play(440, "micfeed");
    // As when the application in front changes: the one that plays now is another process.
    program = startFlashing(300ms);
    session_->updateProcessIDForAudioCaptureWithPID(program->processIdentifier());
    const Time back = now();
    std::this_thread::sleep_for(1000ms);
    record(2500ms);
    const Time end = now();
    const std::string movie = finish();
    heldUp_.stop();
    const auto later = program->stop();
    flashes.insert(flashes.end(), later.begin(), later.end());

    EXPECT_EQ(decodingComplaints(movie), "");
    expectWholeTrack(movie, "a:0");
    expectWholeTrack(movie, "a:1");
    const TrackSound microphone(movie, "a:1");
    const double away = std::chrono::duration<double>(back - killed).count();
    EXPECT_LT(microphone.level(440, movieTime(killed) + 0.2, movieTime(killed) + 0.6), kUnheard);
    EXPECT_LT(microphone.longestAbsence(440, movieTime(killed) - 1, movieTime(end) - 0.5), away + 0.7);
    EXPECT_NEAR(microphone.seconds(), movieTime(end), 0.5);
    const auto pairs = pairsIn(movie, flashes);
    for (const Pair& pair : pairs)
        EXPECT_LE(std::abs(pair.difference), kStep) << "in part " << pair.stretch;
}

}  // namespace
}  // namespace kelvo::test
