#pragma once

#include "platform/FileSystem.h"
#include "platform/MediaService.h"

#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace kelvo {

/// The media service of a module that is loaded at its first use, and stays. Without the module no writer can
/// be made, no movie opened, and every export fails. Any thread.
class LoadedMediaService : public MediaService {
  public:
    /// Looks for the module in `folders` (host paths), in order.
    LoadedMediaService(std::shared_ptr<FileSystem> fileSystem, std::vector<std::string> folders);

    /// Where the module lies for this program: beside it, or in ../lib/kelvod.
    static std::vector<std::string> usualFolders();

    Result<std::shared_ptr<MediaFileWriter>> createFileWriter(const URL& url, MediaFileType type) override;
    /// None without the module.
    std::shared_ptr<WriterInput> createWriterInput(MediaType type, const Dictionary& outputSettings) override;
    std::shared_ptr<BufferQueue> createBufferQueue() override;
    std::shared_ptr<Asset> openAsset(const URL& url) override;
    std::shared_ptr<ExportSession> createExportSession(std::shared_ptr<Asset> asset,
                                                       ExportPreset preset) override;

  private:
    const std::shared_ptr<MediaService>& loaded();
    void load();

    const std::shared_ptr<FileSystem> fileSystem_;
    const std::vector<std::string> folders_;
    std::once_flag once_;
    std::shared_ptr<MediaService> service_;
};

}  // namespace kelvo
