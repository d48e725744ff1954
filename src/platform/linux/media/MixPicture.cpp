#include "platform/linux/media/MixPicture.h"

#include "platform/linux/media/SourceTrack.h"

#include <algorithm>
#include <cmath>
#include <thread>

namespace kelvo {
namespace {

/// x264's scale; from about here on the loss is not seen.
constexpr int kMasterQuality = 18;
/// Encoding takes about four times as long as decoding; more threads than these would only take turns.
constexpr unsigned kCoresForEachDecodingThread = 4;

int decodingThreads() {
    const unsigned cores = std::thread::hardware_concurrency();
    return static_cast<int>(std::max(cores / kCoresForEachDecodingThread, 1U));
}

VideoSettings settingsFor(const AVStream& stream) {
    VideoSettings settings;
    settings.width = stream.codecpar->width;
    settings.height = stream.codecpar->height;
    settings.constantQuality = kMasterQuality;
    settings.frameRate = std::clamp(av_q2d(stream.avg_frame_rate), 1.0, 240.0);
    if (std::isnan(settings.frameRate)) settings.frameRate = 60;
    return settings;
}

TrackFormat formatFor(const AVStream& stream, const VideoEncoder& encoder) {
    const AVCodecParameters& parameters = *stream.codecpar;
    TrackFormat format;
    format.timescale = VideoEncoder::kTimescale;
    format.codecConfiguration = encoder.configuration();
    format.width = static_cast<std::uint16_t>(parameters.width);
    format.height = static_cast<std::uint16_t>(parameters.height);
    format.matrix = matrixOf(stream);
    format.hasOwnColours =
        parameters.color_space == AVCOL_SPC_SMPTE170M && parameters.color_range == AVCOL_RANGE_MPEG;
    return format;
}

}  // namespace

Result<std::unique_ptr<MixPicture>> MixPicture::open(const ExportSource& source,
                                                     VideoEncoder::SampleHandler handler,
                                                     std::function<void(double)> onFrame) {
    const AVStream& stream = source.reader->stream(source.reader->videoStream());
    const AVCodecParameters& parameters = *stream.codecpar;
    auto decoder = Decoder::open(stream, decodingThreads());
    if (!decoder) return decoder.error();
    const VideoEncoder::Source frames{static_cast<AVPixelFormat>(parameters.format),
                                      parameters.color_primaries, parameters.color_trc,
                                      parameters.color_space, parameters.color_range};
    auto encoder = VideoEncoder::open(settingsFor(stream), VideoEncoder::Purpose::master, frames);
    if (!encoder) return encoder.error();
    // The constructor is private, so that every picture has its decoder and encoder.
    return std::unique_ptr<MixPicture>(new MixPicture(source, std::move(*decoder), std::move(*encoder),
                                                      std::move(handler), std::move(onFrame)));
}

MixPicture::MixPicture(const ExportSource& source, Decoder decoder, std::unique_ptr<VideoEncoder> encoder,
                       VideoEncoder::SampleHandler handler, std::function<void(double)> onFrame)
    : source_(source),
      onFrame_(std::move(onFrame)),
      format_(formatFor(source.reader->stream(source.reader->videoStream()), *encoder)),
      decoder_(std::move(decoder)),
      encoder_(std::move(encoder), std::move(handler)) {}

OptionalError MixPicture::decode(const AVPacket* packet) {
    return decoder_.decode(packet, [this](AVFrame& frame) { return encode(frame); });
}

OptionalError MixPicture::encode(AVFrame& frame) {
    if (frame.width != format_.width || frame.height != format_.height) {
        return mediaError(kMediaErrorUnsupportedFormat, "the picture changes its size");
    }
    const double time = source_.secondsFromStart(frame.best_effort_timestamp, source_.reader->videoStream());
    const std::int64_t ticks = std::llround(time * VideoEncoder::kTimescale);
    if (ticks <= lastTime_ || !(time < source_.range.duration.seconds())) return std::nullopt;
    lastTime_ = ticks;
    onFrame_(time);
    return encoder_.encode(frame, ticks);
}

OptionalError MixPicture::flush() {
    const OptionalError error = decode(nullptr);
    return error ? error : encoder_.flush();
}

}  // namespace kelvo
