#pragma once

#include "media/KVCaptureManager.h"
#include "platform/linux/pulse/PulseAudioService.h"
#include "platform/linux/system/SystemClock.h"
#include "support/LogRecorder.h"
#include "support/SoundServer.h"
#include "support/Tones.h"

#include <condition_variable>
#include <cstring>
#include <mutex>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {

using namespace std::chrono_literals;

/// Samples of one track as they come, and a way to wait for them.
class Track {
  public:
    CaptureManager::SampleHandler collector() {
        return [this](const SampleBufferRef& sample) {
            const std::lock_guard lock(mutex_);
            samples_.push_back(sample);
            seconds_ += sample->duration().seconds();
            grows_.notify_all();
        };
    }

    /// Waits until `seconds` more of sound have come, twenty seconds at most, and returns them.
    std::vector<SampleBufferRef> next(double seconds) {
        std::unique_lock lock(mutex_);
        const double end = seconds_ + seconds;
        const std::size_t first = samples_.size();
        grows_.wait_for(lock, 20s, [&] { return seconds_ >= end; });
        return {samples_.begin() + static_cast<std::ptrdiff_t>(first), samples_.end()};
    }
    /// Waits until `isEnough` of everything so far, twenty seconds at most; says whether it came to that.
    template <typename Condition>
    bool waitUntil(Condition isEnough) {
        std::unique_lock lock(mutex_);
        return grows_.wait_for(lock, 20s, [&] { return isEnough(samples_); });
    }
    void clear() {
        const std::lock_guard lock(mutex_);
        samples_.clear();
    }
    std::vector<SampleBufferRef> all() {
        const std::lock_guard lock(mutex_);
        return samples_;
    }

  private:
    std::mutex mutex_;
    std::condition_variable grows_;
    std::vector<SampleBufferRef> samples_;
    double seconds_ = 0;
};

/// The sound of `samples`, one behind the other, in this machine's byte order.
inline std::vector<std::int16_t> soundOf(const std::vector<SampleBufferRef>& samples) {
    std::vector<std::int16_t> sound;
    for (const SampleBufferRef& sample : samples) {
        const bool isBigEndian = (sample->audioFormat().formatFlags & kAudioFlagBigEndian) != 0;
        const auto bytes = sample->audioBytes();
        for (std::size_t i = 0; i + 1 < bytes.size(); i += 2) {
            const auto high = std::to_integer<unsigned>(bytes[isBigEndian ? i : i + 1]);
            const auto low = std::to_integer<unsigned>(bytes[isBigEndian ? i + 1 : i]);
            sound.push_back(static_cast<std::int16_t>(high << 8 | low));
        }
    }
    return sound;
}

inline double amplitudeIn(const std::vector<SampleBufferRef>& samples, double frequency) {
    const auto sound = soundOf(samples);
    return amplitudeOf(frequency, sound);
}

/// Where each sample begins, against the end of the one before it, at worst, in seconds.
inline double worstSeam(const std::vector<SampleBufferRef>& samples) {
    double worst = 0;
    for (std::size_t i = 1; i < samples.size(); ++i) {
        const MediaTime end = samples[i - 1]->presentationTime() + samples[i - 1]->duration();
        worst = std::max(worst, std::abs((samples[i]->presentationTime() - end).seconds()));
    }
    return worst;
}

/// A capture manager on a sound server of its own.
class SoundFixture : public testing::Test {
  protected:
    /// What the test's players say they are; above every real process identifier.
    static constexpr std::int32_t kProcess = 5000001;
    static constexpr std::int32_t kNeighbour = 5000002;
    /// Half of full scale, which is what the players play.
    static constexpr double kPlayed = 16384;

    explicit SoundFixture(SoundServer::Kind kind = SoundServer::Kind::pulseAudio) : server(kind) {}
    ~SoundFixture() override { manager->stopAllCapture(); }

    static Platform soundPlatform() {
        Platform platform;
        platform.clock = std::make_shared<SystemClock>();
        platform.audio = std::make_shared<pulse::PulseAudioService>(platform.clock);
        return platform;
    }

    void startTap(std::int32_t process = kProcess) {
        manager->setCaptureStartTime(MediaTime::make(0, 1));
        manager->startAppAudioCaptureForProcessID(process, appAudio.collector(), nullptr);
    }
    void startMicrophone() { manager->startMicrophoneCaptureWithOutput(microphone.collector(), nullptr); }

    /// Waits until `frequency` is heard on `track`.
    static bool hears(Track& track, double frequency) {
        for (int attempt = 0; attempt < 40; ++attempt) {
            if (amplitudeIn(track.next(0.25), frequency) > kPlayed / 2) return true;
        }
        return false;
    }

    /// Waits for a second of `track` that holds `frequency` as it was played, and `other` at least 60 dB
    /// lower. A busy machine makes a player stutter, which spoils the second that it happens in; another's
    /// tone would spoil them all. The loudness may differ by a part of `tolerance`.
    static bool hearsOnly(Track& track, double frequency, double other, double tolerance = 0.05) {
        for (int attempt = 0; attempt < 15; ++attempt) {
            const auto heard = track.next(1);
            const double wanted = amplitudeIn(heard, frequency);
            if (std::abs(wanted - kPlayed) < kPlayed * tolerance &&
                ratioInDecibels(amplitudeIn(heard, other), wanted) < -60)
                return true;
        }
        return false;
    }

    LogRecorder log;
    SoundServer server;
    Platform platform = soundPlatform();
    std::shared_ptr<KVCaptureManager> manager = KVCaptureManager::create(platform);
    Track microphone;
    Track appAudio;
};

}  // namespace kelvo::test
