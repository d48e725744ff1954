#pragma once

#include "platform/FileSystem.h"
#include "platform/MediaService.h"

#include <memory>

namespace kelvo {

/// Movie files by way of libavcodec and libavformat. Any thread.
class LavMediaService : public MediaService {
  public:
    /// `fileSystem` tells where the device's paths lie for this process.
    explicit LavMediaService(std::shared_ptr<FileSystem> fileSystem) : fileSystem_(std::move(fileSystem)) {}

    Result<std::shared_ptr<MediaFileWriter>> createFileWriter(const URL& url, MediaFileType type) override;
    std::shared_ptr<WriterInput> createWriterInput(MediaType type, const Dictionary& outputSettings) override;
    std::shared_ptr<BufferQueue> createBufferQueue() override;
    std::shared_ptr<Asset> openAsset(const URL& url) override;
    std::shared_ptr<ExportSession> createExportSession(std::shared_ptr<Asset> asset,
                                                       ExportPreset preset) override;

  private:
    const std::shared_ptr<FileSystem> fileSystem_;
};

}  // namespace kelvo
