#pragma once

#include "base/Guarded.h"
#include "base/SerialQueue.h"
#include "platform/Asset.h"
#include "platform/ExportSession.h"
#include "platform/linux/media/MovieExport.h"

#include <memory>
#include <string>

namespace kelvo {

class FileSystem;

/// A movie that was opened: its facts, and where it lies.
class LavAsset : public Asset {
  public:
    LavAsset(std::string path, const MediaTime& duration, std::vector<AssetTrack> tracks)
        : path_(std::move(path)), duration_(duration), tracks_(std::move(tracks)) {}

    /// Where this process finds the file.
    const std::string& path() const { return path_; }
    MediaTime duration() const override { return duration_; }
    std::vector<AssetTrack> tracksWithMediaType(MediaType type) const override;

  private:
    const std::string path_;
    const MediaTime duration_;
    const std::vector<AssetTrack> tracks_;
};

/// An export that runs on a queue of its own, where its completion runs too.
class LavExportSession : public ExportSession, public std::enable_shared_from_this<LavExportSession> {
  public:
    LavExportSession(std::shared_ptr<LavAsset> asset, ExportPreset preset,
                     std::shared_ptr<FileSystem> fileSystem);

    void setOutputURL(const URL& url) override { outputURL_.set(url); }
    void setOutputFileType(MediaFileType) override {}
    void setTimeRange(const MediaTimeRange& range) override { range_.set(range); }
    void setAudioMix(const AudioMix& mix) override { mix_.set(mix); }
    void exportAsynchronously(std::function<void()> completion) override;
    void cancelExport() override { control_.isCancelled = true; }
    Status status() const override { return status_; }
    OptionalError error() const override { return error_.copy(); }
    std::optional<URL> outputURL() const override { return outputURL_.copy(); }
    double progress() const override { return control_.progress; }

  private:
    void run();
    OptionalError exportTo(const std::string& outputPath);

    const std::shared_ptr<LavAsset> asset_;
    const ExportPreset preset_;
    const std::shared_ptr<FileSystem> fileSystem_;
    Guarded<std::optional<URL>> outputURL_;
    Guarded<std::optional<MediaTimeRange>> range_;
    Guarded<std::optional<AudioMix>> mix_;
    Guarded<OptionalError> error_;
    std::atomic<Status> status_{Status::unknown};
    ExportControl control_;
    SerialQueue queue_;
};

}  // namespace kelvo
