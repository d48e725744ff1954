#pragma once

#include "base/KVError.h"
#include "platform/linux/media/MovieFile.h"

#include <chrono>
#include <condition_variable>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <thread>
#include <vector>

namespace kelvo {

/// Gathers the encoded samples of a movie's tracks into fragments and writes them on a thread of its own. A
/// fragment spans at most half a second of each track, and is written at the latest half a second after its
/// first sample came. Thread-safe; the samples of one track come in decoding order, from one thread.
class MovieMuxer {
  public:
    using FailureHandler = std::function<void(const KVError&)>;

    /// `onFailure` runs once, on the muxer's thread, when the file cannot be written. Nothing is written
    /// after that.
    MovieMuxer(std::unique_ptr<MovieFile> file, const std::vector<TrackFormat>& tracks,
               FailureHandler onFailure);
    /// Writes what was gathered and leaves the file unfinished, unless it was finished.
    ~MovieMuxer();
    MovieMuxer(const MovieMuxer&) = delete;
    MovieMuxer& operator=(const MovieMuxer&) = delete;

    /// Adds one sample. Waits while more lies before the disk than memory is meant to hold.
    void append(std::size_t track, const SampleTiming& timing, std::span<const std::byte> data);

    /// Writes everything and finishes the file; see `MovieFile::finish`. Nothing is appended any more.
    OptionalError finish(const MediaTime& end);

  private:
    using Fragment = std::vector<SampleRun>;

    bool belongsToNextFragment(std::size_t track, const SampleTiming& timing) const;
    void closeFragment();
    void work();
    bool awaitFragment(std::unique_lock<std::mutex>& lock);
    void writeFragment(const Fragment& fragment);
    void endThread();

    const std::unique_ptr<MovieFile> file_;
    const FailureHandler onFailure_;
    std::vector<std::int64_t> longestSpans_;  ///< in each track's timescale
    std::mutex mutex_;
    std::condition_variable wakes_;
    std::condition_variable hasRoom_;
    Fragment gathering_;
    std::chrono::steady_clock::time_point gatheringDue_;
    std::deque<Fragment> closed_;
    std::size_t waitingBytes_ = 0;
    bool ending_ = false;
    OptionalError error_;
    std::thread thread_;  // last, so that it starts when everything else is there
};

}  // namespace kelvo
