#include "platform/simulated/SimulatedMedia.h"

#include <cerrno>

namespace kelvo {

/// Remembers a movie that somebody finished.
SimulatedFileWriter::FinishedMovie SimulatedMedia::recorder() const {
    return [movies = movies_](const URL& url, const SimulatedMovie& movie) {
        movies->with([&](auto& all) { all[url.path()] = movie; });
    };
}

void SimulatedMedia::addMovie(const URL& url, const SimulatedMovie& movie) {
    constexpr std::uint64_t kSize = 1000000;
    fileSystem_->addFile(url.path(), kSize);
    recorder()(url, movie);
}

Result<std::shared_ptr<MediaFileWriter>> SimulatedMedia::createFileWriter(const URL& url, MediaFileType) {
    if (const OptionalError error = faults_->take("MediaService.createFileWriter")) return *error;
    if (!url.isFileURL()) return KVError::posix(EINVAL, url.absoluteString());
    auto writer = std::make_shared<SimulatedFileWriter>(url, fileSystem_, faults_, recorder());
    writers_.with([&](auto& writers) { writers.push_back(writer); });
    return std::shared_ptr<MediaFileWriter>(writer);
}

std::shared_ptr<WriterInput> SimulatedMedia::createWriterInput(MediaType type, const Dictionary& settings) {
    return std::make_shared<SimulatedWriterInput>(type, settings);
}

std::shared_ptr<BufferQueue> SimulatedMedia::createBufferQueue() {
    return std::make_shared<SimulatedBufferQueue>(faults_);
}

std::shared_ptr<Asset> SimulatedMedia::openAsset(const URL& url) {
    const auto movie = movies_->with([&](const auto& all) -> std::optional<SimulatedMovie> {
        const auto entry = all.find(url.path());
        if (entry == all.end()) return std::nullopt;
        return entry->second;
    });
    if (!movie || !fileSystem_->itemExists(url.path())) return nullptr;
    return std::make_shared<SimulatedAsset>(*movie);
}

std::shared_ptr<ExportSession> SimulatedMedia::createExportSession(std::shared_ptr<Asset> asset,
                                                                   ExportPreset preset) {
    auto session = std::make_shared<SimulatedExportSession>(std::move(asset), preset, holdsExports_,
                                                            fileSystem_, faults_, recorder());
    exports_.with([&](auto& exports) { exports.push_back(session); });
    return session;
}

}  // namespace kelvo
