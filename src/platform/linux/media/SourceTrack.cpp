#include "platform/linux/media/SourceTrack.h"

#include <cstring>

namespace kelvo {

bool isSoundOrPicture(const AVStream& stream) {
    const AVMediaType type = stream.codecpar->codec_type;
    return type == AVMEDIA_TYPE_VIDEO || type == AVMEDIA_TYPE_AUDIO;
}

Result<TrackFormat> trackFormatOf(const AVStream& stream) {
    const AVCodecParameters& parameters = *stream.codecpar;
    const bool isKnown = parameters.codec_id == AV_CODEC_ID_H264 || parameters.codec_id == AV_CODEC_ID_AAC;
    if (!isKnown || parameters.extradata_size <= 0 || stream.time_base.num != 1) {
        return mediaError(kMediaErrorUnsupportedFormat, "only H.264 and AAC are copied");
    }
    TrackFormat format;
    format.type = parameters.codec_type == AVMEDIA_TYPE_VIDEO ? MediaType::video : MediaType::audio;
    format.timescale = static_cast<std::uint32_t>(stream.time_base.den);
    const auto extra =
        std::as_bytes(std::span(parameters.extradata, static_cast<std::size_t>(parameters.extradata_size)));
    format.codecConfiguration.assign(extra.begin(), extra.end());
    format.width = static_cast<std::uint16_t>(parameters.width);
    format.height = static_cast<std::uint16_t>(parameters.height);
    format.matrix = matrixOf(stream);
    format.hasOwnColours =
        parameters.color_space == AVCOL_SPC_SMPTE170M && parameters.color_range == AVCOL_RANGE_MPEG;
    format.sampleRate = static_cast<std::uint32_t>(parameters.sample_rate);
    format.channelCount = static_cast<std::uint16_t>(parameters.ch_layout.nb_channels);
    format.bitRate = static_cast<std::uint32_t>(parameters.bit_rate);
    return format;
}

TrackFormat::Matrix matrixOf(const AVStream& stream) {
    TrackFormat::Matrix matrix = TrackFormat::kUpright;
    std::size_t size = 0;
    const std::uint8_t* data = av_stream_get_side_data(&stream, AV_PKT_DATA_DISPLAYMATRIX, &size);
    if (data != nullptr && size >= sizeof(matrix)) std::memcpy(matrix.data(), data, sizeof(matrix));
    return matrix;
}

std::int64_t skippedSamples(const AVPacket& packet) {
    std::size_t size = 0;
    std::uint32_t count = 0;
    const std::uint8_t* data = av_packet_get_side_data(&packet, AV_PKT_DATA_SKIP_SAMPLES, &size);
    if (data != nullptr && size >= sizeof(count)) std::memcpy(&count, data, sizeof(count));
    return count;
}

}  // namespace kelvo
