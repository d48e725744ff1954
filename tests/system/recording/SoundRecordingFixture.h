#pragma once

#include "RecordingFixture.h"
#include "support/Tones.h"

#include <algorithm>

namespace kelvo::test {

/// With a sound server, which the daemon learns of as it starts.
class SoundRecordingFixture : public RecordingFixture {
  protected:
    static constexpr int kSpoken = 440;  ///< into the microphone
    static constexpr int kPlayed = 880;  ///< by the application
    /// Of a tone that is in a movie; one that is not is weaker by far.
    static constexpr double kHeard = 500;
    static constexpr double kSilent = 50;

    void SetUp() override {
        ASSERT_TRUE(sound_.start());
        startDaemon();
    }

    /// How loud the tone is in half of the track's quarters of a second at least: neither the silence before
    /// it was tapped counts nor that a player stuttered.
    static double amplitude(const std::string& movie, const std::string& stream, double frequency) {
        constexpr std::size_t kPiece = 44100 / 4;
        std::vector<std::int16_t> samples;
        for (const float sample : decodedSound(movie, stream))
            samples.push_back(static_cast<std::int16_t>(std::clamp(sample, -1.0F, 1.0F) * 32767));
        std::vector<double> pieces;
        for (std::size_t at = 0; at + kPiece <= samples.size(); at += kPiece)
            pieces.push_back(amplitudeOf(frequency, std::span(samples).subspan(at, kPiece)));
        std::ranges::sort(pieces);
        return pieces.empty() ? 0 : pieces[pieces.size() / 2];
    }

    /// Lets somebody speak and `client` play, and waits until both are heard.
    void makeSound(const ClientProcess& client) {
        spoken_ = sound_.play(kSpoken, "micfeed");
        played_ = sound_.play(kPlayed, "speaker", client.processIdentifier());
        ASSERT_TRUE(eventually([&] {
            return std::ranges::count(sound_.answer("list short sink-inputs"), '\n') == 2;
        })) << "both play";
    }

    SoundServer sound_;
    std::unique_ptr<ChildProcess> spoken_;
    std::unique_ptr<ChildProcess> played_;
};

}  // namespace kelvo::test
