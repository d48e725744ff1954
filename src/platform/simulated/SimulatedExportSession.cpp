#include "platform/simulated/SimulatedExportSession.h"

#include "base/GlobalQueue.h"
#include "platform/MediaErrors.h"

#include <cerrno>

namespace kelvo {
namespace {

constexpr std::uint64_t kExportedSize = 1000000;

}  // namespace

std::vector<AssetTrack> SimulatedAsset::tracksWithMediaType(MediaType type) const {
    std::vector<AssetTrack> tracks;
    for (std::size_t i = 0; i < movie_.tracks.size(); ++i) {
        if (movie_.tracks[i] == type) tracks.push_back({static_cast<std::uint32_t>(i + 1), type});
    }
    return tracks;
}

SimulatedExportSession::SimulatedExportSession(std::shared_ptr<Asset> asset, ExportPreset preset, bool isHeld,
                                               std::shared_ptr<SimulatedFileSystem> fileSystem,
                                               std::shared_ptr<SimulatedFaults> faults,
                                               FinishedMovie onFinished)
    : asset_(std::move(asset)),
      preset_(preset),
      isHeld_(isHeld),
      fileSystem_(std::move(fileSystem)),
      faults_(std::move(faults)),
      onFinished_(std::move(onFinished)) {}

void SimulatedExportSession::exportAsynchronously(std::function<void()> completion) {
    completion_.set(std::move(completion));
    status_ = Status::exporting;
    if (!isHeld_) resume();
}

void SimulatedExportSession::resume() {
    GlobalQueue::get(QueuePriority::normal).async([self = shared_from_this()] {
        auto expected = Status::exporting;
        const OptionalError error = self->reasonToFail();
        if (error) self->error_.set(error);
        const Status outcome = error ? Status::failed : Status::completed;
        if (self->status_.compare_exchange_strong(expected, outcome)) self->end();
    });
}

void SimulatedExportSession::cancelExport() {
    auto expected = Status::exporting;
    if (!status_.compare_exchange_strong(expected, Status::cancelled)) return;
    GlobalQueue::get(QueuePriority::normal).async([self = shared_from_this()] { self->end(); });
}

OptionalError SimulatedExportSession::reasonToFail() const {
    if (OptionalError ordered = faults_->take("ExportSession.export")) return ordered;
    if (!asset_) return mediaError(kMediaErrorUnreadableMovie, "no movie");
    const auto range = timeRange();
    if (range && !(compare(range->duration, MediaTime::zero()) > 0)) {
        return mediaError(kMediaErrorInvalidRange, "empty time range");
    }
    const auto url = outputURL();
    if (!url || !url->isFileURL()) return mediaError(kMediaErrorMisuse, "no output file");
    if (fileSystem_->itemExists(url->path())) return KVError::posix(EEXIST, url->path());
    return std::nullopt;
}

/// A mix has one audio track at most; a pass-through has them all.
SimulatedMovie SimulatedExportSession::result() const {
    SimulatedMovie movie{timeRange() ? timeRange()->duration : asset_->duration(), {MediaType::video}};
    std::size_t audioCount = asset_->tracksWithMediaType(MediaType::audio).size();
    if (preset_ == ExportPreset::highestQuality && audioCount > 1) audioCount = 1;
    movie.tracks.resize(1 + audioCount, MediaType::audio);
    return movie;
}

void SimulatedExportSession::end() {
    if (status_ == Status::completed) {
        progress_ = 1;
        fileSystem_->addFile(outputURL()->path(), kExportedSize);
        onFinished_(*outputURL(), result());
    }
    // The completion usually holds the session: it is dropped once it has run.
    if (const auto completion = completion_.exchange(nullptr)) completion();
}

}  // namespace kelvo
