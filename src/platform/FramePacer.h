#pragma once

#include <algorithm>
#include <chrono>

namespace kelvo {

/// Says when a change of the picture is due to be captured, so that no more than one frame an interval is.
/// Times are on the monotonic clock. Single-threaded.
///
/// Frames keep to a schedule instead of to each other: a frame that came late does not push the ones after
/// it back, or one hiccup would delay a steady 60 pictures a second for good. So two frames may be as close
/// as half an interval, but over any time there is never more than one an interval, plus two.
class FramePacer {
  public:
    using Time = std::chrono::nanoseconds;

    explicit FramePacer(Time interval) : interval_(interval) {}

    /// When a change first seen at `change` is due: at the latest one interval after it.
    Time due(Time change) const { return std::max(change, next_ - slack()); }

    /// A frame that was due at `due` was captured at `now`.
    void captured(Time due, Time now) { next_ = std::max({next_, due, now - slack()}) + interval_; }

  private:
    Time slack() const { return interval_ / 4; }

    const Time interval_;
    Time next_ = Time::min() / 2;
};

}  // namespace kelvo
