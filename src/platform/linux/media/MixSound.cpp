#include "platform/linux/media/MixSound.h"

namespace kelvo {
namespace {

constexpr std::int64_t kMixBitRate = 192000;
constexpr int kMostChannels = 8;
/// A track that is silent for longer than this, against what was read last, holds the mix up no more.
constexpr double kLongestWait = 3;

AudioSettings mixSettings() {
    AudioSettings settings;
    settings.bitRate = kMixBitRate;
    return settings;
}

}  // namespace

Result<std::unique_ptr<MixSound>> MixSound::open(const ExportSource& source, const std::vector<int>& streams,
                                                 AudioEncoder::SampleHandler handler) {
    auto encoder = AudioEncoder::open(mixSettings(), std::move(handler));
    if (!encoder) return encoder.error();
    // The constructor is private, so that every mix has all of its tracks.
    std::unique_ptr<MixSound> sound(new MixSound(source, std::move(*encoder), streams.size()));
    for (const int stream : streams) {
        if (const OptionalError error = sound->addTrack(stream)) return *error;
    }
    return sound;
}

MixSound::MixSound(const ExportSource& source, std::unique_ptr<AudioEncoder> encoder, std::size_t trackCount)
    : source_(source), encoder_(std::move(encoder)), bus_(trackCount, *encoder_) {}

OptionalError MixSound::addTrack(int stream) {
    auto decoder = Decoder::open(source_.reader->stream(stream), 1);
    if (!decoder) return decoder.error();
    AlignedAudioSink& sink = bus_.track(tracks_.size());
    tracks_.push_back({stream, std::move(*decoder), AudioAligner(mixSettings().sampleRate, sink)});
    return std::nullopt;
}

OptionalError MixSound::take(const AVPacket& packet) {
    for (Track& track : tracks_) {
        if (track.stream != packet.stream_index) continue;
        if (OptionalError error = decode(track, &packet)) return error;
        const double reached = source_.secondsFromStart(packet.pts, track.stream) - kLongestWait;
        return bus_.mixUntil(static_cast<std::int64_t>(reached * mixSettings().sampleRate));
    }
    return std::nullopt;
}

OptionalError MixSound::decode(Track& track, const AVPacket* packet) {
    return track.decoder.decode(packet, [&](AVFrame& frame) { return add(track, frame); });
}

OptionalError MixSound::add(Track& track, const AVFrame& frame) {
    if (frame.format != AV_SAMPLE_FMT_FLTP || frame.ch_layout.nb_channels > kMostChannels) {
        return mediaError(kMediaErrorUnsupportedFormat, "sound of an unusual form");
    }
    PcmBlock block{static_cast<double>(frame.sample_rate), {}};
    for (int i = 0; i < frame.ch_layout.nb_channels; ++i) {
        const auto* samples = reinterpret_cast<const float*>(frame.extended_data[i]);
        block.channels.emplace_back(samples, samples + frame.nb_samples);
    }
    return track.aligner.add(std::move(block),
                             source_.secondsFromStart(frame.best_effort_timestamp, track.stream));
}

OptionalError MixSound::flush() {
    for (Track& track : tracks_) {
        if (OptionalError error = decode(track, nullptr)) return error;
        if (OptionalError error = track.aligner.flush()) return error;
    }
    const OptionalError error = bus_.flush();
    return error ? error : encoder_->flush();
}

}  // namespace kelvo
