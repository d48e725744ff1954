#pragma once

#include "base/Guarded.h"

#include <array>
#include <chrono>
#include <cstdint>
#include <span>
#include <vector>

namespace kelvo::pulse {

/// Puts the sound of several streams together on one time line and reads it off in order, with silence where
/// nothing sounds. Thread-safe; nothing is allocated after construction.
///
/// Sound may be read once every stream has come past it, and at the latest `kPatience` after its moment: a
/// stream that is late by more loses what came too late.
class MixTimeline {
  public:
    static constexpr std::chrono::milliseconds kPatience{200};
    /// How long sound without any stream waits for one to come.
    static constexpr std::chrono::milliseconds kSettling{40};
    static constexpr std::size_t kMostStreams = 16;
    static constexpr std::chrono::milliseconds kSlack{10};
    static constexpr std::chrono::milliseconds kLongestOverlap{100};
    static constexpr std::chrono::seconds kReach{4};

    /// From the moment `start` on; `channels` 16-bit samples a frame.
    MixTimeline(std::chrono::nanoseconds start, std::uint32_t rate, std::uint32_t channels);

    /// Identifies a stream; none when there are `kMostStreams` already.
    using StreamIndex = std::size_t;
    static constexpr StreamIndex kNoStream = kMostStreams;
    /// A stream that begins at the moment `now`.
    StreamIndex addStream(std::chrono::nanoseconds now);
    void removeStream(StreamIndex stream);

    /// Adds `samples` (whole frames) of `stream` that began to sound at `moment`. A block that comes within
    /// `kSlack` of the end of the one before follows it without a seam, and is made a frame longer or shorter
    /// where that brings the stream back to its moments. What lies before the end of the stream so far,
    /// before the reading position, or more than `kReach` ahead of it, is lost; but a stream that falls back
    /// by more than `kLongestOverlap` begins anew there.
    void write(StreamIndex stream, std::chrono::nanoseconds moment, std::span<const std::int16_t> samples);

    /// How many frames can be read at the moment `now`.
    std::int64_t readableFrames(std::chrono::nanoseconds now) const;

    /// Where the next frame to be read stands.
    std::chrono::nanoseconds position() const;
    std::int64_t framesRead() const;

    /// Reads whole frames, in big-endian byte order when `isBigEndian`, and moves on.
    void read(std::span<std::byte> bytes, bool isBigEndian);

  private:
    struct Stream {
        bool isUsed = false;
        bool hasSounded = false;
        std::int64_t end = 0;  ///< the frame behind the last one that was written
    };
    struct State {
        std::vector<std::int32_t> sums;  ///< a ring: frame f stands at (f % capacity) * channels
        std::array<Stream, kMostStreams> streams;
        std::int64_t next = 0;  ///< the frame to be read next, counted from the start
    };

    std::int64_t frameAt(std::chrono::nanoseconds moment) const;
    /// Adds `samples` from `frame` on and, when `lengthens` is 1, their last frame once more.
    void mix(State& state, std::int64_t frame, std::span<const std::int16_t> samples,
             std::int64_t lengthens) const;
    void mixFrame(State& state, std::int64_t frame, std::span<const std::int16_t> samples) const;

    const std::chrono::nanoseconds start_;
    const std::uint32_t rate_;
    const std::uint32_t channels_;
    const std::int64_t capacity_;
    Guarded<State> state_;
};

}  // namespace kelvo::pulse
