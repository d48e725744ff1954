#include "platform/linux/media/MovieReader.h"

#include <algorithm>
#include <cerrno>
#include <span>
#include <sys/stat.h>

namespace kelvo {
namespace {

constexpr unsigned kMostTracks = 32;
constexpr std::int64_t kLongestMovie = 7LL * 24 * 60 * 60 * AV_TIME_BASE;

KVError unreadable(std::string_view why) {
    return mediaError(kMediaErrorUnreadableMovie, why);
}

/// Whether everything that the index of `stream` names lies within the file.
bool isWhole(AVStream* stream, std::int64_t fileSize) {
    const int count = avformat_index_get_entries_count(stream);
    for (int i = 0; i < count; ++i) {
        const AVIndexEntry* entry = avformat_index_get_entry(stream, i);
        if (entry->pos < 0 || entry->pos + entry->size > fileSize) return false;
    }
    return true;
}

FormatContextPointer openContext(const std::string& path, int& result) {
    AVFormatContext* context = avformat_alloc_context();
    if (context == nullptr) return nullptr;
    AVDictionary* options = nullptr;
    // A movie of ours is one file: whatever else it names is not followed.
    av_dict_set(&options, "protocol_whitelist", "file", 0);
    av_dict_set(&options, "enable_drefs", "0", 0);
    // On failure the context is freed, and set to none.
    result = avformat_open_input(&context, ("file:" + path).c_str(), av_find_input_format("mp4"), &options);
    av_dict_free(&options);
    return FormatContextPointer(context);
}

}  // namespace

MovieReader::MovieReader(FormatContextPointer context)
    : context_(std::move(context)), packet_(av_packet_alloc()) {}

Result<std::unique_ptr<MovieReader>> MovieReader::open(const std::string& path) {
    prepareLav();
    // Looked at before it is opened: a pipe would keep its reader waiting.
    struct stat status {};
    if (::stat(path.c_str(), &status) != 0) return KVError::posix(errno, path);
    if (!S_ISREG(status.st_mode)) return unreadable("not a file");
    int result = AVERROR(ENOMEM);
    FormatContextPointer context = openContext(path, result);
    if (!context) return lavError(result, kMediaErrorUnreadableMovie, "movie");
    // The constructor is private, so that every reader is open.
    std::unique_ptr<MovieReader> reader(new MovieReader(std::move(context)));
    if (!reader->packet_) return KVError::posix(ENOMEM, path);
    if (const OptionalError error = reader->check(status.st_size)) return *error;
    if (reader->context().duration <= 0) reader->findDurationOfFragments();
    if (reader->context().duration > kLongestMovie) return unreadable("absurdly long");
    return reader;
}

/// The header of a movie in fragments tells no duration. Reading on with every track discarded goes through
/// the fragments' headers and leaves their samples alone.
void MovieReader::findDurationOfFragments() {
    const std::span streams(context_->streams, context_->nb_streams);
    for (AVStream* each : streams)
        each->discard = AVDISCARD_ALL;
    static_cast<void>(av_read_frame(context_.get(), packet_.get()));
    context_->duration = 0;
    for (AVStream* each : streams) {
        each->discard = AVDISCARD_DEFAULT;
        if (each->duration == AV_NOPTS_VALUE) continue;
        const std::int64_t duration = av_rescale_q(each->duration, each->time_base, {1, AV_TIME_BASE});
        context_->duration = std::max(context_->duration, duration);
    }
    static_cast<void>(avformat_seek_file(context_.get(), -1, INT64_MIN, 0, 0, 0));
}

OptionalError MovieReader::check(std::int64_t fileSize) const {
    if (context_->nb_streams == 0) return unreadable("no tracks");
    if (context_->nb_streams > kMostTracks) return unreadable("too many tracks");
    for (unsigned i = 0; i < context_->nb_streams; ++i) {
        if (!isWhole(context_->streams[i], fileSize)) return unreadable("cut short");
    }
    if (videoStream() < 0) return unreadable("no picture");
    return std::nullopt;
}

int MovieReader::videoStream() const {
    for (unsigned i = 0; i < context_->nb_streams; ++i) {
        if (context_->streams[i]->codecpar->codec_type == AVMEDIA_TYPE_VIDEO) return static_cast<int>(i);
    }
    return -1;
}

std::vector<int> MovieReader::audioStreams() const {
    std::vector<int> streams;
    for (unsigned i = 0; i < context_->nb_streams; ++i) {
        if (context_->streams[i]->codecpar->codec_type == AVMEDIA_TYPE_AUDIO)
            streams.push_back(static_cast<int>(i));
    }
    return streams;
}

MediaTime MovieReader::duration() const {
    if (context_->duration == AV_NOPTS_VALUE) return MediaTime::zero();
    return MediaTime::make(context_->duration, AV_TIME_BASE);
}

std::vector<AssetTrack> MovieReader::tracks(MediaType type) const {
    std::vector<AssetTrack> tracks;
    const AVMediaType wanted = type == MediaType::video ? AVMEDIA_TYPE_VIDEO : AVMEDIA_TYPE_AUDIO;
    for (unsigned i = 0; i < context_->nb_streams; ++i) {
        const AVStream* stream = context_->streams[i];
        if (stream->codecpar->codec_type == wanted)
            tracks.push_back({static_cast<std::uint32_t>(stream->id), type});
    }
    return tracks;
}

Result<AVPacket*> MovieReader::next() {
    av_packet_unref(packet_.get());
    const int result = av_read_frame(context_.get(), packet_.get());
    if (result == AVERROR_EOF) return nullptr;
    if (result < 0) return lavError(result, kMediaErrorUnreadableMovie, "movie");
    if ((packet_->flags & AV_PKT_FLAG_CORRUPT) != 0) return unreadable("cut short");
    return packet_.get();
}

OptionalError MovieReader::seek(double seconds) {
    const int video = videoStream();
    const AVRational unit = stream(video).time_base;
    const auto time = static_cast<std::int64_t>(seconds / av_q2d(unit));
    const int result = av_seek_frame(context_.get(), video, time, AVSEEK_FLAG_BACKWARD);
    if (result < 0) return lavError(result, kMediaErrorUnreadableMovie, "movie");
    return std::nullopt;
}

}  // namespace kelvo
