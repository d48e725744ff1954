#pragma once

#include "base/KVError.h"
#include "base/MovieTimeline.h"
#include "platform/linux/media/AudioAligner.h"
#include "platform/linux/media/PcmReader.h"

#include <deque>
#include <functional>
#include <optional>

namespace kelvo {

/// Cuts one track's sound where the pictures were cut, and moves what is left to where they were moved. What
/// sounded between the last frame before a cut and the first one after it is left out. Caller's thread.
///
/// Sound that begins anew after some silence, later than any frame, may be the first after a cut that no
/// frame has told of yet. It waits for the next frame, but not for longer than `kPatience`.
class SoundCutter {
  public:
    /// A pause leaves at least as much silence.
    static constexpr double kSilence = 0.2;   // seconds
    static constexpr double kPatience = 1.0;  // seconds of sound

    /// Takes a block that begins at `sourceTime`. `joint` is exact where a new stretch begins.
    using Sink =
        std::function<OptionalError(PcmBlock block, const MediaTime& sourceTime, AudioAligner::Joint joint)>;

    explicit SoundCutter(Sink sink) : sink_(std::move(sink)) {}

    /// Adds a block that was captured from `captureTime` on.
    OptionalError add(PcmBlock block, const MediaTime& captureTime, const MovieTimeline& timeline);
    /// Hands over what still waits.
    OptionalError flush(const MovieTimeline& timeline);

  private:
    using Stretches = std::vector<MovieTimeline::Stretch>;
    struct Held {
        PcmBlock block;
        MediaTime begin;
    };

    bool mustWait(const Stretches& stretches) const;
    OptionalError handOverFirst(const Stretches& stretches);
    OptionalError handOverPart(const Held& held, const MovieTimeline::Stretch& stretch, std::size_t first,
                               std::size_t last);

    const Sink sink_;
    std::deque<Held> held_;
    double heldSeconds_ = 0;
    MediaTime end_;  ///< of what was handed over, by the clock of its capture
    int stretchNumber_ = 0;
};

}  // namespace kelvo
