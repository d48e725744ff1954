#pragma once

#include "base/Guarded.h"
#include "platform/MediaService.h"
#include "platform/simulated/SimulatedExportSession.h"
#include "platform/simulated/SimulatedFaults.h"
#include "platform/simulated/SimulatedFileSystem.h"
#include "platform/simulated/SimulatedMediaWriter.h"

#include <atomic>
#include <map>
#include <memory>
#include <string>
#include <vector>

namespace kelvo {

/// Movie files without media: a finished writer or export leaves a movie that can be opened as an asset.
/// Fails where "MediaService.createFileWriter" was ordered to. Thread-safe.
class SimulatedMedia : public MediaService {
  public:
    SimulatedMedia(std::shared_ptr<SimulatedFileSystem> fileSystem, std::shared_ptr<SimulatedFaults> faults)
        : fileSystem_(std::move(fileSystem)), faults_(std::move(faults)) {}

    /// Puts a movie at `url`.
    void addMovie(const URL& url, const SimulatedMovie& movie);

    /// Whether exports created from now on wait until the test resumes or cancels them.
    void holdExports(bool isHeld) { holdsExports_ = isHeld; }

    /// What was made so far, in order.
    std::vector<std::shared_ptr<SimulatedFileWriter>> writers() const { return writers_.copy(); }
    std::vector<std::shared_ptr<SimulatedExportSession>> exportSessions() const { return exports_.copy(); }

    Result<std::shared_ptr<MediaFileWriter>> createFileWriter(const URL& url, MediaFileType type) override;
    std::shared_ptr<WriterInput> createWriterInput(MediaType type, const Dictionary& settings) override;
    std::shared_ptr<BufferQueue> createBufferQueue() override;
    std::shared_ptr<Asset> openAsset(const URL& url) override;
    std::shared_ptr<ExportSession> createExportSession(std::shared_ptr<Asset> asset,
                                                       ExportPreset preset) override;

  private:
    using Movies = Guarded<std::map<std::string, SimulatedMovie>>;

    SimulatedFileWriter::FinishedMovie recorder() const;

    std::shared_ptr<SimulatedFileSystem> fileSystem_;
    std::shared_ptr<SimulatedFaults> faults_;
    const std::shared_ptr<Movies> movies_ = std::make_shared<Movies>();
    Guarded<std::vector<std::shared_ptr<SimulatedFileWriter>>> writers_;
    Guarded<std::vector<std::shared_ptr<SimulatedExportSession>>> exports_;
    std::atomic<bool> holdsExports_{false};
};

}  // namespace kelvo
