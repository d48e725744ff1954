#include "platform/linux/media/ExportParts.h"

namespace kelvo {

std::optional<MediaTimeRange> clippedRange(const std::optional<MediaTimeRange>& range,
                                           const MediaTime& whole) {
    const MediaTimeRange wanted = range.value_or(MediaTimeRange{MediaTime::zero(), whole});
    const MediaTime start = compare(wanted.start, MediaTime::zero()) < 0 ? MediaTime::zero() : wanted.start;
    MediaTime end = wanted.start + wanted.duration;
    if (compare(end, whole) > 0) end = whole;
    const MediaTimeRange clipped{start, end - start};
    if (!(compare(clipped.duration, MediaTime::zero()) > 0)) return std::nullopt;
    return clipped;
}

Result<ExportSource> ExportSource::open(const ExportRequest& request) {
    auto reader = MovieReader::open(request.sourcePath);
    if (!reader) return reader.error();
    const auto range = clippedRange(request.range, (*reader)->duration());
    if (!range) return mediaError(kMediaErrorInvalidRange, "nothing of the movie lies in the time range");
    return ExportSource{std::move(*reader), *range};
}

OptionalError ExportFile::create(const std::string& path, const std::vector<TrackFormat>& tracks) {
    auto file = MovieFile::create(path, tracks, MovieFile::Durability::cached);
    if (!file) return file.error();
    muxer_ = std::make_unique<MovieMuxer>(std::move(*file), tracks,
                                          [this](const KVError& error) { error_.set(error); });
    return std::nullopt;
}

OptionalError forEachPacket(const ExportSource& source, const ExportControl& control, const ExportFile& file,
                            const std::function<bool()>& isDone,
                            const std::function<OptionalError(const AVPacket&)>& take) {
    if (OptionalError error = source.reader->seek(source.range.start.seconds())) return error;
    while (!control.isCancelled && !isDone()) {
        const auto packet = source.reader->next();
        if (!packet) return packet.error();
        if (*packet == nullptr) break;
        if (OptionalError error = take(**packet)) return error;
        if (OptionalError error = file.error()) return error;
    }
    return std::nullopt;
}

}  // namespace kelvo
