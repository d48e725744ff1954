#pragma once

#include "FlashMovie.h"
#include "FlashProgram.h"
#include "platform/linux/pulse/PulseAudioService.h"
#include "support/RecordedSession.h"
#include "support/SoundServer.h"

#include <memory>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {

using namespace std::chrono_literals;

/// The sound server must be there, by name at least, before whatever connects to it.
class WithSoundServer {
  protected:
    SoundServer sound_;
};

/// A screen and a sound server of the test's own, recorded into a movie file with both its tracks of sound.
class SoundtrackFixture : protected WithSoundServer, public RecordedSession {
  protected:
    static constexpr int kWidth = 160;
    static constexpr int kHeight = 120;
    /// How far apart picture and sound may be in the movie, in seconds.
    static constexpr double kStep = 0.015;

    SoundtrackFixture()
        : RecordedSession(kWidth, kHeight,
                          std::make_shared<pulse::PulseAudioService>(std::make_shared<SystemClock>())) {
        session_->setSystemRecording(true);
        session_->setMicrophoneEnabled(true);
    }
    void SetUp() override { ASSERT_TRUE(sound_.start()); }
    void TearDown() override { session_->stopAllCapture(); }

    /// Its sound is the one that is recorded from the next start on.
    std::unique_ptr<FlashProgram> startFlashing(std::chrono::milliseconds interval) {
        auto program = std::make_unique<FlashProgram>(server_.display(), kWidth, kHeight, interval);
        session_->setFrontmostPIDForAudioTap(program->processIdentifier());
        return program;
    }

    /// What became of one flash and its beep.
    struct Pair {
        std::size_t stretch;  ///< number of
        Time moment;
        double difference;  ///< by how much the beep comes after the flash in the movie, in seconds
    };

    /// The flashes of the recorded stretches that neither the machine nor the program spoilt; each must be in
    /// the movie, and so must its beep.
    std::vector<Pair> pairsIn(const std::string& movie,
                              const std::vector<FlashProgram::Flash>& flashes) const {
        constexpr Time kBefore = 300ms;  // the server collects, and so does the tap
        constexpr Time kAfter = 400ms;
        const auto seen = flashesIn(movie);
        const auto heard = beepsIn(movie, "a:0");
        std::vector<Pair> pairs;
        for (const auto& flash : flashes) {
            const auto stretch = stretchOf(flash.promised - kBefore, flash.done + kAfter);
            if (!stretch || !flash.isPunctual) continue;
            if (heldUp_.touch(flash.promised - 150ms, flash.done + 50ms)) continue;
            const double expected =
                std::chrono::duration<double>(flash.done - stretch->offset - beginning_).count();
            const auto shown = nearest(seen, expected, 0.1);
            const auto sounded = nearest(heard, expected, 0.1);
            EXPECT_TRUE(shown) << "flash at " << expected;
            EXPECT_TRUE(sounded) << "beep at " << expected;
            if (!shown || !sounded) continue;
            pairs.push_back({numberOf(*stretch), flash.done, *sounded - *shown});
        }
        return pairs;
    }

    std::size_t numberOf(const Stretch& stretch) const {
        const auto found = std::ranges::find_if(
            stretches_, [&](const Stretch& each) { return each.begin == stretch.begin; });
        return static_cast<std::size_t>(found - stretches_.begin());
    }
};

}  // namespace kelvo::test
