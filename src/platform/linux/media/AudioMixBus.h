#pragma once

#include "platform/linux/media/AudioAligner.h"

#include <cstdint>
#include <deque>
#include <memory>
#include <vector>

namespace kelvo {

/// Adds up the sound of several tracks on one timeline and hands on the sum, limited to the full scale. Holds
/// only what lies between the track that is furthest ahead and the one furthest behind. Caller's thread.
class AudioMixBus {
  public:
    AudioMixBus(std::size_t trackCount, AlignedAudioSink& output);

    /// Where the sound of one track goes.
    AlignedAudioSink& track(std::size_t index) { return tracks_[index]; }

    /// Encodes what every track has reached; and what lies before `position`, silent where a track has
    /// nothing to say there.
    OptionalError mixUntil(std::int64_t position);

    /// Encodes everything up to the end of the longest track.
    OptionalError flush();

  private:
    class Track : public AlignedAudioSink {
      public:
        explicit Track(AudioMixBus& bus) : bus_(bus) {}
        void begin(std::int64_t position) override { end_ = position; }
        OptionalError samples(std::span<const float> left, std::span<const float> right) override;
        OptionalError silence(std::int64_t count) override;
        std::int64_t end() const { return end_; }

      private:
        AudioMixBus& bus_;
        std::int64_t end_ = 0;
    };

    void add(std::int64_t position, std::span<const float> left, std::span<const float> right);
    OptionalError encodeUntil(std::int64_t position);

    AlignedAudioSink& output_;
    std::deque<Track> tracks_;
    std::int64_t position_ = 0;  ///< of the first sample that is not encoded yet
    std::vector<float> left_;    ///< the sums from there on
    std::vector<float> right_;
};

}  // namespace kelvo
