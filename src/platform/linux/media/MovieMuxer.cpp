#include "platform/linux/media/MovieMuxer.h"

#include "base/ThreadName.h"

namespace kelvo {
namespace {

constexpr std::chrono::milliseconds kLongestFragment{500};
constexpr std::size_t kMostWaitingBytes = 32 * 1024 * 1024;

bool hasSamples(const std::vector<SampleRun>& fragment) {
    for (const SampleRun& run : fragment) {
        if (!run.empty()) return true;
    }
    return false;
}

}  // namespace

MovieMuxer::MovieMuxer(std::unique_ptr<MovieFile> file, const std::vector<TrackFormat>& tracks,
                       FailureHandler onFailure)
    : file_(std::move(file)), onFailure_(std::move(onFailure)), gathering_(tracks.size()) {
    for (const TrackFormat& track : tracks)
        longestSpans_.push_back(std::int64_t{track.timescale} * kLongestFragment.count() / 1000);
    thread_ = std::thread([this] { work(); });
}

MovieMuxer::~MovieMuxer() {
    endThread();
}

void MovieMuxer::append(std::size_t track, const SampleTiming& timing, std::span<const std::byte> data) {
    std::unique_lock lock(mutex_);
    hasRoom_.wait(lock, [this] { return waitingBytes_ < kMostWaitingBytes || error_ || ending_; });
    if (error_ || ending_) return;
    if (belongsToNextFragment(track, timing)) closeFragment();
    if (!hasSamples(gathering_)) {
        gatheringDue_ = std::chrono::steady_clock::now() + kLongestFragment;
        wakes_.notify_one();
    }
    SampleRun& run = gathering_[track];
    if (!run.empty()) {
        // In a run, a sample begins where the one before it ends.
        SampleTiming& last = run.samples.back().timing;
        last.duration = static_cast<std::uint32_t>(timing.decodeTime - last.decodeTime);
    }
    run.samples.push_back({timing, static_cast<std::uint32_t>(data.size())});
    run.data.insert(run.data.end(), data.begin(), data.end());
    waitingBytes_ += data.size();
}

/// A fragment ends before a sample that would make it too long.
bool MovieMuxer::belongsToNextFragment(std::size_t track, const SampleTiming& timing) const {
    const auto& samples = gathering_[track].samples;
    return !samples.empty() && timing.decodeTime - samples.front().timing.decodeTime >= longestSpans_[track];
}

void MovieMuxer::closeFragment() {
    Fragment next(gathering_.size());
    // The next one will be about as large: growing step by step would copy it over and over.
    for (std::size_t i = 0; i < next.size(); ++i) {
        next[i].samples.reserve(gathering_[i].samples.size());
        next[i].data.reserve(gathering_[i].data.size());
    }
    closed_.push_back(std::exchange(gathering_, std::move(next)));
    wakes_.notify_one();
}

void MovieMuxer::work() {
    nameCurrentThread("MovieFile");
    std::unique_lock lock(mutex_);
    while (awaitFragment(lock)) {
        const Fragment fragment = std::move(closed_.front());
        closed_.pop_front();
        lock.unlock();
        writeFragment(fragment);
        lock.lock();
    }
}

/// Waits for a closed fragment, closing the one that is gathered when its time has come. False when the muxer
/// ends and nothing is left.
bool MovieMuxer::awaitFragment(std::unique_lock<std::mutex>& lock) {
    while (closed_.empty()) {
        if (!hasSamples(gathering_)) {
            if (ending_) return false;
            wakes_.wait(lock);
        } else if (ending_ || std::chrono::steady_clock::now() >= gatheringDue_) {
            closeFragment();
        } else {
            wakes_.wait_until(lock, gatheringDue_);
        }
    }
    return true;
}

void MovieMuxer::writeFragment(const Fragment& fragment) {
    std::size_t size = 0;
    for (const SampleRun& run : fragment)
        size += run.data.size();
    // Only this thread sets the error.
    OptionalError error;
    if (!error_) error = file_->appendFragment(fragment);
    {
        std::lock_guard lock(mutex_);
        if (error) error_ = error;
        waitingBytes_ -= size;
    }
    hasRoom_.notify_all();
    if (error) onFailure_(*error);
}

void MovieMuxer::endThread() {
    {
        std::lock_guard lock(mutex_);
        ending_ = true;
    }
    wakes_.notify_one();
    hasRoom_.notify_all();
    if (thread_.joinable()) thread_.join();
}

OptionalError MovieMuxer::finish(const MediaTime& end) {
    endThread();
    return error_ ? error_ : file_->finish(end);
}

}  // namespace kelvo
