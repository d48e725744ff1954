#include "base/Guarded.h"
#include "platform/linux/media/AudioAligner.h"
#include "platform/linux/media/AudioEncoder.h"
#include "platform/linux/media/AudioMixBus.h"
#include "platform/linux/media/Decoder.h"
#include "platform/linux/media/MovieExport.h"
#include "platform/linux/media/MovieMuxer.h"
#include "platform/linux/media/MovieReader.h"
#include "platform/linux/media/SourceTrack.h"
#include "platform/linux/media/VideoEncoder.h"

#include <algorithm>
#include <cmath>
#include <deque>

namespace kelvo {
namespace {

/// x264's scale; from about here on the loss is not seen.
constexpr int kMasterQuality = 18;
constexpr std::int64_t kMixBitRate = 192000;
constexpr std::size_t kVideoTrack = 0;
constexpr std::size_t kAudioTrack = 1;
/// A track that is silent for longer than this, against what was read last, holds the mix up no more.
constexpr double kLongestWait = 3;

class Mix {
  public:
    Mix(MovieReader& reader, const MediaTimeRange& range, const ExportRequest& request,
        ExportControl& control)
        : reader_(reader), range_(range), request_(request), control_(control) {}

    OptionalError run();

  private:
    struct AudioTrack {
        int stream = 0;
        Decoder decoder;
        AudioAligner aligner;
    };

    OptionalError open();
    OptionalError openVideo();
    OptionalError openAudio();
    OptionalError openFile();
    std::vector<int> mixedStreams() const;
    OptionalError take(const AVPacket& packet);
    OptionalError encodeFrame(AVFrame& frame);
    OptionalError addSound(AudioTrack& track, const AVFrame& frame);
    OptionalError flush();
    void append(std::size_t track, const SampleTiming& timing, std::span<const std::byte> data) {
        muxer_->append(track, timing, data);
    }
    VideoEncoder::SampleHandler videoHandler() {
        return [this](const auto& timing, auto data) { append(kVideoTrack, timing, data); };
    }
    /// The time in seconds from the range's start.
    double seconds(std::int64_t time, int stream) const {
        return static_cast<double>(time) * av_q2d(reader_.stream(stream).time_base) - range_.start.seconds();
    }

    MovieReader& reader_;
    const MediaTimeRange range_;
    const ExportRequest& request_;
    ExportControl& control_;
    std::optional<Decoder> videoDecoder_;
    std::unique_ptr<VideoEncoder> videoEncoder_;
    std::int64_t lastVideoTime_ = -1;
    std::unique_ptr<AudioEncoder> audioEncoder_;
    std::optional<AudioMixBus> bus_;
    std::deque<AudioTrack> audioTracks_;
    std::vector<TrackFormat> formats_;
    Guarded<OptionalError> muxerError_;
    std::unique_ptr<MovieMuxer> muxer_;
};

OptionalError Mix::run() {
    if (OptionalError error = open()) return error;
    while (!control_.isCancelled) {
        const auto packet = reader_.next();
        if (!packet) return packet.error();
        if (*packet == nullptr) break;
        if (OptionalError error = take(**packet)) return error;
        if (OptionalError error = muxerError_.copy()) return error;
    }
    if (control_.isCancelled) return std::nullopt;
    if (OptionalError error = flush()) return error;
    return muxer_->finish(range_.duration);
}

OptionalError Mix::open() {
    // The decoder's pixel format, which the encoder must know, stands in the stream and not in the file.
    const int result = avformat_find_stream_info(&reader_.context(), nullptr);
    if (result < 0) return lavError(result, kMediaErrorUnreadableMovie, "movie");
    if (OptionalError error = openVideo()) return error;
    if (OptionalError error = openAudio()) return error;
    if (OptionalError error = openFile()) return error;
    return reader_.seek(range_.start.seconds());
}

OptionalError Mix::openVideo() {
    const AVStream& stream = reader_.stream(reader_.videoStream());
    const AVCodecParameters& parameters = *stream.codecpar;
    auto decoder = Decoder::open(stream);
    if (!decoder) return decoder.error();
    videoDecoder_ = std::move(*decoder);
    VideoSettings settings;
    settings.width = parameters.width;
    settings.height = parameters.height;
    settings.constantQuality = kMasterQuality;
    settings.frameRate = std::clamp(av_q2d(stream.avg_frame_rate), 1.0, 240.0);
    if (std::isnan(settings.frameRate)) settings.frameRate = 60;
    const VideoEncoder::Source source{static_cast<AVPixelFormat>(parameters.format),
                                      parameters.color_primaries, parameters.color_trc,
                                      parameters.color_space, parameters.color_range};
    auto encoder = VideoEncoder::open(settings, VideoEncoder::Purpose::master, source);
    if (!encoder) return encoder.error();
    videoEncoder_ = std::move(*encoder);
    TrackFormat format;
    format.timescale = VideoEncoder::kTimescale;
    format.codecConfiguration = videoEncoder_->configuration();
    format.width = static_cast<std::uint16_t>(settings.width);
    format.height = static_cast<std::uint16_t>(settings.height);
    format.matrix = matrixOf(stream);
    format.hasOwnColours =
        parameters.color_space == AVCOL_SPC_SMPTE170M && parameters.color_range == AVCOL_RANGE_MPEG;
    formats_.push_back(std::move(format));
    return std::nullopt;
}

std::vector<int> Mix::mixedStreams() const {
    std::vector<int> streams = reader_.audioStreams();
    if (!request_.mix) return streams;
    std::erase_if(streams, [this](int index) {
        const AudioMixInputParameters wanted{static_cast<std::uint32_t>(reader_.stream(index).id)};
        return std::ranges::count(request_.mix->inputParameters, wanted) == 0;
    });
    return streams;
}

OptionalError Mix::openAudio() {
    const std::vector<int> streams = mixedStreams();
    if (streams.empty()) return std::nullopt;
    AudioSettings settings;
    settings.bitRate = kMixBitRate;
    auto encoder = AudioEncoder::open(
        settings, [this](const auto& timing, auto data) { append(kAudioTrack, timing, data); });
    if (!encoder) return encoder.error();
    audioEncoder_ = std::move(*encoder);
    formats_.push_back(audioEncoder_->trackFormat());
    bus_.emplace(streams.size(), *audioEncoder_);
    for (const int stream : streams) {
        auto decoder = Decoder::open(reader_.stream(stream));
        if (!decoder) return decoder.error();
        AlignedAudioSink& sink = bus_->track(audioTracks_.size());
        audioTracks_.push_back({stream, std::move(*decoder), AudioAligner(settings.sampleRate, sink)});
    }
    return std::nullopt;
}

OptionalError Mix::openFile() {
    auto file = MovieFile::create(request_.outputPath, formats_, MovieFile::Durability::cached);
    if (!file) return file.error();
    muxer_ = std::make_unique<MovieMuxer>(std::move(*file), formats_,
                                          [this](const KVError& error) { muxerError_.set(error); });
    return std::nullopt;
}

OptionalError Mix::take(const AVPacket& packet) {
    if (packet.stream_index == reader_.videoStream()) {
        return videoDecoder_->decode(&packet, [this](AVFrame& frame) { return encodeFrame(frame); });
    }
    for (AudioTrack& track : audioTracks_) {
        if (track.stream != packet.stream_index) continue;
        OptionalError error =
            track.decoder.decode(&packet, [&](AVFrame& frame) { return addSound(track, frame); });
        if (error) return error;
        const double reached = seconds(packet.pts, track.stream) - kLongestWait;
        return bus_->mixUntil(static_cast<std::int64_t>(reached * AudioSettings().sampleRate));
    }
    return std::nullopt;
}

OptionalError Mix::encodeFrame(AVFrame& frame) {
    if (frame.width != formats_[kVideoTrack].width || frame.height != formats_[kVideoTrack].height) {
        return mediaError(kMediaErrorUnsupportedFormat, "the picture changes its size");
    }
    const double time = seconds(frame.best_effort_timestamp, reader_.videoStream());
    const std::int64_t ticks = std::llround(time * VideoEncoder::kTimescale);
    if (ticks <= lastVideoTime_ || !(time < range_.duration.seconds())) return std::nullopt;
    lastVideoTime_ = ticks;
    control_.advanceTo(time / range_.duration.seconds());
    return videoEncoder_->encode(frame, ticks, videoHandler());
}

OptionalError Mix::addSound(AudioTrack& track, const AVFrame& frame) {
    if (frame.format != AV_SAMPLE_FMT_FLTP || frame.ch_layout.nb_channels > 8) {
        return mediaError(kMediaErrorUnsupportedFormat, "sound of an unusual form");
    }
    PcmBlock block{static_cast<double>(frame.sample_rate), {}};
    for (int i = 0; i < frame.ch_layout.nb_channels; ++i) {
        const auto* samples = reinterpret_cast<const float*>(frame.extended_data[i]);
        block.channels.emplace_back(samples, samples + frame.nb_samples);
    }
    return track.aligner.add(std::move(block), seconds(frame.best_effort_timestamp, track.stream));
}

OptionalError Mix::flush() {
    OptionalError error =
        videoDecoder_->decode(nullptr, [this](AVFrame& frame) { return encodeFrame(frame); });
    for (AudioTrack& track : audioTracks_) {
        if (!error) {
            error = track.decoder.decode(nullptr, [&](AVFrame& frame) { return addSound(track, frame); });
        }
        if (!error) error = track.aligner.flush();
    }
    if (!error) error = videoEncoder_->flush(videoHandler());
    if (!error && bus_) error = bus_->flush();
    if (!error && audioEncoder_) error = audioEncoder_->flush();
    return error;
}

}  // namespace

OptionalError exportMix(const ExportRequest& request, ExportControl& control) {
    const auto reader = MovieReader::open(request.sourcePath);
    if (!reader) return reader.error();
    const auto range = clippedRange(request.range, (*reader)->duration());
    if (!range) return mediaError(kMediaErrorInvalidRange, "nothing of the movie lies in the time range");
    return Mix(**reader, *range, request, control).run();
}

}  // namespace kelvo
