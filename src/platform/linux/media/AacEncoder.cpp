#include "platform/linux/media/AacEncoder.h"

#include <algorithm>
#include <cstring>

namespace kelvo {
namespace {

CodecContextPointer configuredContext(const AVCodec& codec, const AudioSettings& settings, int channelCount) {
    CodecContextPointer context(avcodec_alloc_context3(&codec));
    if (!context) return nullptr;
    context->sample_fmt = AV_SAMPLE_FMT_FLTP;
    context->sample_rate = settings.sampleRate;
    av_channel_layout_default(&context->ch_layout, channelCount);
    context->bit_rate = settings.bitRate;
    context->time_base = {1, settings.sampleRate};
    context->profile = FF_PROFILE_AAC_LOW;
    context->flags |= AV_CODEC_FLAG_GLOBAL_HEADER;
    context->flags |= AV_CODEC_FLAG_BITEXACT;  // no element in the first frame that only names the encoder
    return context;
}

FramePointer frameFor(const AVCodecContext& context) {
    FramePointer frame(av_frame_alloc());
    if (!frame) return nullptr;
    frame->format = context.sample_fmt;
    frame->sample_rate = context.sample_rate;
    frame->nb_samples = context.frame_size;
    if (av_channel_layout_copy(&frame->ch_layout, &context.ch_layout) < 0) return nullptr;
    return av_frame_get_buffer(frame.get(), 0) < 0 ? nullptr : std::move(frame);
}

}  // namespace

Result<AacEncoder> AacEncoder::open(const AudioSettings& settings, int channelCount) {
    prepareLav();
    const AVCodec* codec = avcodec_find_encoder(AV_CODEC_ID_AAC);
    CodecContextPointer context =
        codec == nullptr ? nullptr : configuredContext(*codec, settings, channelCount);
    if (context && avcodec_open2(context.get(), codec, nullptr) >= 0 && context->frame_size > 0) {
        AacEncoder encoder(std::move(context));
        if (encoder.frame_ && encoder.packet_) return encoder;
    }
    return mediaError(kMediaErrorEncoderUnavailable, "no AAC encoder takes these settings");
}

AacEncoder::AacEncoder(CodecContextPointer context)
    : context_(std::move(context)), frame_(frameFor(*context_)), packet_(av_packet_alloc()) {}

std::span<const std::byte> AacEncoder::configuration() const {
    return std::as_bytes(std::span(context_->extradata, static_cast<std::size_t>(context_->extradata_size)));
}

OptionalError AacEncoder::encode(std::span<const float> left, std::span<const float> right,
                                 const PacketHandler& handler) {
    if (av_frame_make_writable(frame_.get()) < 0) return KVError::posix(ENOMEM, "audio encoder");
    frame_->nb_samples = static_cast<int>(left.size());
    frame_->pts = encodedCount_;
    encodedCount_ += frame_->nb_samples;
    std::memcpy(frame_->data[0], left.data(), left.size_bytes());
    if (channelCount() > 1) std::memcpy(frame_->data[1], right.data(), right.size_bytes());
    return send(frame_.get(), handler);
}

OptionalError AacEncoder::flush(const PacketHandler& handler) {
    return encodedCount_ == 0 ? std::nullopt : send(nullptr, handler);
}

OptionalError AacEncoder::send(const AVFrame* frame, const PacketHandler& handler) {
    OptionalError handlerError;
    int result = avcodec_send_frame(context_.get(), frame);
    while (result >= 0 && !handlerError) {
        result = avcodec_receive_packet(context_.get(), packet_.get());
        if (result < 0) break;
        const auto whole = static_cast<std::int64_t>(frameSize());
        handlerError =
            handler(std::as_bytes(std::span(packet_->data, static_cast<std::size_t>(packet_->size))),
                    packet_->duration > 0 ? std::min(packet_->duration, whole) : whole);
        av_packet_unref(packet_.get());
    }
    if (handlerError || result == AVERROR(EAGAIN) || result == AVERROR_EOF) return handlerError;
    return lavError(result, kMediaErrorEncodingFailed, "audio encoder");
}

}  // namespace kelvo
