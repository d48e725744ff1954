#include "platform/linux/media/ExportParts.h"
#include "platform/linux/media/SourceTrack.h"

#include <algorithm>
#include <cstring>
#include <deque>
#include <limits>

namespace kelvo {
namespace {

/// A track needs its first packet to be known before the file's header is written; a track whose first packet
/// lies further behind the start than this begins late. In seconds.
constexpr double kLongestSearch = 2;

/// Carries the packets of the chosen range from the source into the new file.
class PassThrough {
  public:
    PassThrough(const ExportSource& source, const ExportRequest& request, ExportControl& control)
        : source_(source), request_(request), control_(control) {}

    OptionalError run();

  private:
    /// One track on its way. Times in the track's timescale, from the source's beginning.
    struct Track {
        TrackFormat format;
        std::size_t number = 0;
        std::int64_t start = 0;
        std::int64_t end = 0;
        std::int64_t lastDecodeTime = std::numeric_limits<std::int64_t>::min();
        bool hasPackets = false;
        bool hasEnded = false;
    };

    OptionalError openTracks();
    OptionalError take(const AVPacket& packet);
    bool isWanted(Track& track, const AVPacket& packet) const;
    OptionalError write(const Track& track, const AVPacket& packet);
    OptionalError beginFile();
    bool mustWaitForTracks(const AVPacket& packet) const;
    bool allTracksEnded() const;
    double secondsFromStart(const AVPacket& packet) const {
        return source_.secondsFromStart(packet.dts, packet.stream_index);
    }

    const ExportSource& source_;
    const ExportRequest& request_;
    ExportControl& control_;
    std::vector<std::optional<Track>> tracks_;  ///< by the source's stream number
    std::deque<PacketPointer> waiting_;         ///< until the file begins
    ExportFile file_;
};

OptionalError PassThrough::run() {
    if (OptionalError error = openTracks()) return error;
    OptionalError error = forEachPacket(
        source_, control_, file_, [this] { return allTracksEnded(); },
        [this](const auto& packet) { return take(packet); });
    if (error || control_.isCancelled) return error;
    if (!file_.isCreated()) error = beginFile();
    return error ? error : file_.finish(source_.range.duration);
}

OptionalError PassThrough::openTracks() {
    std::size_t number = 0;
    for (unsigned i = 0; i < source_.reader->context().nb_streams; ++i) {
        const AVStream& stream = source_.reader->stream(static_cast<int>(i));
        auto& track = tracks_.emplace_back();
        if (!isSoundOrPicture(stream)) continue;
        auto format = trackFormatOf(stream);
        if (!format) return format.error();
        const auto timescale = static_cast<std::int32_t>(format->timescale);
        const MediaTime end = source_.range.start + source_.range.duration;
        track = Track{std::move(*format), number++, source_.range.start.convertedTo(timescale).value,
                      end.convertedTo(timescale).value};
    }
    return std::nullopt;
}

OptionalError PassThrough::take(const AVPacket& packet) {
    const auto index = static_cast<std::size_t>(packet.stream_index);
    if (index >= tracks_.size() || !tracks_[index]) return std::nullopt;
    Track& track = *tracks_[index];
    if (packet.dts == AV_NOPTS_VALUE || packet.pts == AV_NOPTS_VALUE || packet.dts <= track.lastDecodeTime) {
        return mediaError(kMediaErrorUnreadableMovie, "times run backwards");
    }
    track.lastDecodeTime = packet.dts;
    if (!isWanted(track, packet)) return std::nullopt;
    if (!track.hasPackets) {
        track.hasPackets = true;
        const std::int64_t shownFrom = std::max(track.start, packet.dts + skippedSamples(packet));
        track.format.lead = shownFrom - packet.dts;
    }
    if (file_.isCreated()) return write(track, packet);
    const bool mustWait = mustWaitForTracks(packet);
    waiting_.emplace_back(av_packet_clone(&packet));
    if (!waiting_.back()) return KVError::posix(ENOMEM, "packet");
    return mustWait ? std::nullopt : beginFile();
}

/// Sound is wanted from the packet before the one that holds the start, for the decoder to warm up.
bool PassThrough::isWanted(Track& track, const AVPacket& packet) const {
    if (packet.dts >= track.end) track.hasEnded = true;
    if (track.hasEnded) return false;
    return track.format.type == MediaType::video || packet.pts + 2 * packet.duration > track.start;
}

bool PassThrough::mustWaitForTracks(const AVPacket& packet) const {
    const bool allKnown = std::all_of(tracks_.begin(), tracks_.end(), [](const auto& track) {
        return !track || track->hasPackets || track->hasEnded;
    });
    return !allKnown && secondsFromStart(packet) < kLongestSearch;
}

OptionalError PassThrough::beginFile() {
    std::vector<TrackFormat> formats;
    for (const auto& track : tracks_) {
        if (track) formats.push_back(track->format);
    }
    if (OptionalError error = file_.create(request_.outputPath, formats)) return error;
    for (const PacketPointer& packet : waiting_) {
        const Track& track = *tracks_[static_cast<std::size_t>(packet->stream_index)];
        if (OptionalError error = write(track, *packet)) return error;
    }
    waiting_.clear();
    return std::nullopt;
}

OptionalError PassThrough::write(const Track& track, const AVPacket& packet) {
    const SampleTiming timing{packet.dts - track.start, static_cast<std::int32_t>(packet.pts - packet.dts),
                              static_cast<std::uint32_t>(std::max<std::int64_t>(packet.duration, 1)),
                              (packet.flags & AV_PKT_FLAG_KEY) != 0};
    if (timing.decodeTime + track.format.lead < 0) return std::nullopt;
    file_.append(track.number, timing,
                 std::as_bytes(std::span(packet.data, static_cast<std::size_t>(packet.size))));
    if (track.format.type == MediaType::video) {
        control_.advanceTo(secondsFromStart(packet) / source_.range.duration.seconds());
    }
    return std::nullopt;
}

bool PassThrough::allTracksEnded() const {
    return std::all_of(tracks_.begin(), tracks_.end(),
                       [](const auto& track) { return !track || track->hasEnded; });
}

}  // namespace

OptionalError exportPassThrough(const ExportRequest& request, ExportControl& control) {
    const auto source = ExportSource::open(request);
    return source ? PassThrough(*source, request, control).run() : source.error();
}

}  // namespace kelvo
