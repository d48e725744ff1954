#pragma once

#include "base/Guarded.h"
#include "base/MediaTime.h"

#include <vector>

namespace kelvo {

/// Where a movie's time begins, and which moments of the host's clock it shows: stretches, between which
/// something (a pause) was cut out. Told by the frames, read by the sound. Thread-safe.
class MovieTimeline {
  public:
    /// Captured without a cut in between. What was captured at `moment` is presented at `moment - shift`.
    struct Stretch {
        int number = 0;        ///< counted through the movie
        MediaTime firstFrame;  ///< when it was captured
        MediaTime lastFrame;   ///< of those so far
        MediaTime shift;
    };

    /// Older stretches are forgotten: no sound comes that late.
    static constexpr std::size_t kMostStretches = 64;

    void begin(const MediaTime& start) { start_.set(start); }
    /// Invalid before `begin`.
    MediaTime start() const { return start_.copy(); }

    /// A frame captured at `captureTime` is presented at `sourceTime`. Nothing when either is invalid.
    void relate(const MediaTime& captureTime, const MediaTime& sourceTime);

    /// The stretches so far, oldest first; none before the first frame.
    std::vector<Stretch> stretches() const { return stretches_.copy(); }

    /// When what was captured at `captureTime` is presented; invalid for what was cut out.
    MediaTime sourceTime(const MediaTime& captureTime) const;

    /// Whether all frames so far, of which there is one at least, were captured before `captureTime`.
    bool isBehindTheFrames(const MediaTime& captureTime) const;

  private:
    Guarded<MediaTime> start_;
    Guarded<std::vector<Stretch>> stretches_;
};

}  // namespace kelvo
