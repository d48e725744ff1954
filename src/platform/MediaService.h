#pragma once

#include "base/Result.h"
#include "platform/Asset.h"
#include "platform/BufferQueue.h"
#include "platform/ExportSession.h"
#include "platform/MediaFileWriter.h"
#include "platform/WriterInput.h"

#include <memory>

namespace kelvo {

/// Makes what reads and writes movie files. Implemented by the Linux media adapter and the simulated device.
/// URLs carry paths of the device. Thread-safe.
class MediaService {
  public:
    virtual ~MediaService() = default;

    /// A writer of a new file at `url`. Fails when no file can be made there: not a file URL, no such folder.
    virtual Result<std::shared_ptr<MediaFileWriter>> createFileWriter(const URL& url, MediaFileType type) = 0;

    /// An input with the given output settings (see MediaSettings.h). Settings that no encoder takes show up
    /// when the writer starts.
    virtual std::shared_ptr<WriterInput> createWriterInput(MediaType type,
                                                           const Dictionary& outputSettings) = 0;

    virtual std::shared_ptr<BufferQueue> createBufferQueue() = 0;

    /// The movie at `url`; none when it cannot be opened as one. Reads the file's index, so it blocks for as
    /// long as that takes.
    virtual std::shared_ptr<Asset> openAsset(const URL& url) = 0;

    /// An export of `asset`, which this service opened. Without an asset the export fails.
    virtual std::shared_ptr<ExportSession> createExportSession(std::shared_ptr<Asset> asset,
                                                               ExportPreset preset) = 0;
};

}  // namespace kelvo
