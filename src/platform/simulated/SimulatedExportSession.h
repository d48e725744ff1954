#pragma once

#include "base/Guarded.h"
#include "platform/Asset.h"
#include "platform/ExportSession.h"
#include "platform/simulated/SimulatedFaults.h"
#include "platform/simulated/SimulatedMediaWriter.h"

#include <atomic>
#include <memory>
#include <vector>

namespace kelvo {

/// A movie that is there. Its tracks are numbered from 1.
class SimulatedAsset : public Asset {
  public:
    explicit SimulatedAsset(SimulatedMovie movie) : movie_(std::move(movie)) {}

    MediaTime duration() const override { return movie_.duration; }
    std::vector<AssetTrack> tracksWithMediaType(MediaType type) const override;

  private:
    const SimulatedMovie movie_;
};

/// An export that ends at once, on the global queue, unless it is held: then when the test says so. Fails
/// without an asset, when its range is empty, when something stands at its output URL, and when
/// "ExportSession.export" was ordered to. Thread-safe.
class SimulatedExportSession : public ExportSession,
                               public std::enable_shared_from_this<SimulatedExportSession> {
  public:
    using FinishedMovie = SimulatedFileWriter::FinishedMovie;

    SimulatedExportSession(std::shared_ptr<Asset> asset, ExportPreset preset, bool isHeld,
                           std::shared_ptr<SimulatedFileSystem> fileSystem,
                           std::shared_ptr<SimulatedFaults> faults, FinishedMovie onFinished);

    ExportPreset preset() const { return preset_; }
    std::optional<MediaTimeRange> timeRange() const { return timeRange_.copy(); }
    std::optional<AudioMix> audioMix() const { return audioMix_.copy(); }

    /// Lets a held export run.
    void resume();
    /// A held export gets as far as this.
    void setProgress(double progress) { progress_ = progress; }

    void setOutputURL(const URL& url) override { outputURL_.set(url); }
    void setOutputFileType(MediaFileType) override {}
    void setTimeRange(const MediaTimeRange& range) override { timeRange_.set(range); }
    void setAudioMix(const AudioMix& mix) override { audioMix_.set(mix); }
    void exportAsynchronously(std::function<void()> completion) override;
    void cancelExport() override;
    Status status() const override { return status_; }
    OptionalError error() const override { return error_.copy(); }
    std::optional<URL> outputURL() const override { return outputURL_.copy(); }
    double progress() const override { return progress_; }

  private:
    OptionalError reasonToFail() const;
    SimulatedMovie result() const;
    void end();

    const std::shared_ptr<Asset> asset_;
    const ExportPreset preset_;
    const bool isHeld_;
    std::shared_ptr<SimulatedFileSystem> fileSystem_;
    std::shared_ptr<SimulatedFaults> faults_;
    const FinishedMovie onFinished_;
    Guarded<std::optional<URL>> outputURL_;
    Guarded<std::optional<MediaTimeRange>> timeRange_;
    Guarded<std::optional<AudioMix>> audioMix_;
    Guarded<OptionalError> error_;
    Guarded<std::function<void()>> completion_;
    std::atomic<Status> status_{Status::unknown};
    std::atomic<double> progress_{0};
};

}  // namespace kelvo
