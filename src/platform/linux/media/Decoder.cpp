#include "platform/linux/media/Decoder.h"

namespace kelvo {

Decoder::Decoder(CodecContextPointer context) : context_(std::move(context)), frame_(av_frame_alloc()) {}

Result<Decoder> Decoder::open(const AVStream& stream, int threadCount) {
    const AVCodec* codec = avcodec_find_decoder(stream.codecpar->codec_id);
    CodecContextPointer context(codec == nullptr ? nullptr : avcodec_alloc_context3(codec));
    if (!context || avcodec_parameters_to_context(context.get(), stream.codecpar) < 0) {
        return mediaError(kMediaErrorUnsupportedFormat, "no decoder for a track");
    }
    context->pkt_timebase = stream.time_base;
    context->thread_count = threadCount;
    const int result = avcodec_open2(context.get(), codec, nullptr);
    if (result < 0) return lavError(result, kMediaErrorUnsupportedFormat, "decoder");
    Decoder decoder(std::move(context));
    if (!decoder.frame_) return KVError::posix(ENOMEM, "decoder");
    return decoder;
}

OptionalError Decoder::decode(const AVPacket* packet, const FrameHandler& handler) {
    int result = avcodec_send_packet(context_.get(), packet);
    while (result >= 0) {
        result = avcodec_receive_frame(context_.get(), frame_.get());
        if (result < 0) break;
        OptionalError error = handler(*frame_);
        av_frame_unref(frame_.get());
        if (error) return error;
    }
    if (result == AVERROR(EAGAIN) || result == AVERROR_EOF) return std::nullopt;
    return lavError(result, kMediaErrorUnreadableMovie, "decoder");
}

}  // namespace kelvo
