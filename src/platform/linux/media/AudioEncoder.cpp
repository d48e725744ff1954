#include "platform/linux/media/AudioEncoder.h"

#include <algorithm>
#include <cstring>

namespace kelvo {
namespace {

/// After this much silence each further frame of silence encodes to the same bytes.
constexpr std::int64_t kFramesUntilSteady = 8;

CodecContextPointer configuredContext(const AVCodec& codec, const AudioSettings& settings) {
    CodecContextPointer context(avcodec_alloc_context3(&codec));
    if (!context) return nullptr;
    context->sample_fmt = AV_SAMPLE_FMT_FLTP;
    context->sample_rate = settings.sampleRate;
    context->ch_layout = AV_CHANNEL_LAYOUT_STEREO;
    context->bit_rate = settings.bitRate;
    context->time_base = {1, settings.sampleRate};
    context->profile = FF_PROFILE_AAC_LOW;
    context->flags |= AV_CODEC_FLAG_GLOBAL_HEADER;
    return context;
}

FramePointer frameFor(const AVCodecContext& context) {
    FramePointer frame(av_frame_alloc());
    if (!frame) return nullptr;
    frame->format = context.sample_fmt;
    frame->sample_rate = context.sample_rate;
    frame->ch_layout = AV_CHANNEL_LAYOUT_STEREO;
    frame->nb_samples = context.frame_size;
    return av_frame_get_buffer(frame.get(), 0) < 0 ? nullptr : std::move(frame);
}

}  // namespace

Result<std::unique_ptr<AudioEncoder>> AudioEncoder::open(const AudioSettings& settings,
                                                         SampleHandler handler) {
    prepareLav();
    const AVCodec* codec = avcodec_find_encoder(AV_CODEC_ID_AAC);
    CodecContextPointer context = codec == nullptr ? nullptr : configuredContext(*codec, settings);
    const bool isOpen =
        context && avcodec_open2(context.get(), codec, nullptr) >= 0 && context->frame_size > 0;
    // The constructor is private, so that every encoder is open.
    std::unique_ptr<AudioEncoder> encoder(isOpen ? new AudioEncoder(std::move(context), std::move(handler))
                                                 : nullptr);
    if (!encoder || !encoder->frame_ || !encoder->packet_) {
        return mediaError(kMediaErrorEncoderUnavailable, "no AAC encoder takes these settings");
    }
    return encoder;
}

AudioEncoder::AudioEncoder(CodecContextPointer context, SampleHandler handler)
    : context_(std::move(context)),
      handler_(std::move(handler)),
      frame_(frameFor(*context_)),
      packet_(av_packet_alloc()),
      frameSize_(static_cast<std::size_t>(context_->frame_size)) {}

TrackFormat AudioEncoder::trackFormat() const {
    TrackFormat format;
    format.type = MediaType::audio;
    format.timescale = static_cast<std::uint32_t>(context_->sample_rate);
    format.lead = context_->initial_padding;
    const auto extra =
        std::as_bytes(std::span(context_->extradata, static_cast<std::size_t>(context_->extradata_size)));
    format.codecConfiguration.assign(extra.begin(), extra.end());
    format.sampleRate = static_cast<std::uint32_t>(context_->sample_rate);
    format.channelCount = 2;
    format.bitRate = static_cast<std::uint32_t>(context_->bit_rate);
    return format;
}

void AudioEncoder::begin(std::int64_t position) {
    nextDecodeTime_ = position - context_->initial_padding;
}

OptionalError AudioEncoder::samples(std::span<const float> left, std::span<const float> right) {
    while (!left.empty()) {
        const std::size_t count = std::min(frameSize_ - left_.size(), left.size());
        left_.insert(left_.end(), left.begin(), left.begin() + static_cast<std::ptrdiff_t>(count));
        right_.insert(right_.end(), right.begin(), right.begin() + static_cast<std::ptrdiff_t>(count));
        left = left.subspan(count);
        right = right.subspan(count);
        if (left_.size() < frameSize_) break;
        if (OptionalError error = encodeGathered()) return error;
    }
    return std::nullopt;
}

OptionalError AudioEncoder::silence(std::int64_t count) {
    const auto frameSize = static_cast<std::int64_t>(frameSize_);
    const std::int64_t repeated = count / frameSize - kFramesUntilSteady;
    if (repeated <= 0) return encodeZeros(count);
    if (OptionalError error = encodeZeros(kFramesUntilSteady * frameSize)) return error;
    for (std::int64_t i = 0; i < repeated; ++i)
        handOver(lastSample_, static_cast<std::uint32_t>(frameSize));
    return encodeZeros(count - (kFramesUntilSteady + repeated) * frameSize);
}

OptionalError AudioEncoder::encodeZeros(std::int64_t count) {
    const std::vector<float> zeros(static_cast<std::size_t>(count));
    return samples(zeros, zeros);
}

OptionalError AudioEncoder::encodeGathered() {
    if (av_frame_make_writable(frame_.get()) < 0) return KVError::posix(ENOMEM, "audio encoder");
    frame_->nb_samples = static_cast<int>(left_.size());
    frame_->pts = encodedCount_;
    encodedCount_ += static_cast<std::int64_t>(left_.size());
    std::memcpy(frame_->data[0], left_.data(), left_.size() * sizeof(float));
    std::memcpy(frame_->data[1], right_.data(), right_.size() * sizeof(float));
    left_.clear();
    right_.clear();
    return send(frame_.get());
}

OptionalError AudioEncoder::flush() {
    if (!left_.empty()) {
        if (OptionalError error = encodeGathered()) return error;
    }
    return encodedCount_ == 0 ? std::nullopt : send(nullptr);
}

OptionalError AudioEncoder::send(const AVFrame* frame) {
    int result = avcodec_send_frame(context_.get(), frame);
    while (result >= 0) {
        result = avcodec_receive_packet(context_.get(), packet_.get());
        if (result < 0) break;
        const auto data = std::as_bytes(std::span(packet_->data, static_cast<std::size_t>(packet_->size)));
        lastSample_.assign(data.begin(), data.end());
        const auto whole = static_cast<std::int64_t>(frameSize_);
        handOver(lastSample_, static_cast<std::uint32_t>(
                                  packet_->duration > 0 ? std::min(packet_->duration, whole) : whole));
        av_packet_unref(packet_.get());
    }
    if (result == AVERROR(EAGAIN) || result == AVERROR_EOF) return std::nullopt;
    return lavError(result, kMediaErrorEncodingFailed, "audio encoder");
}

/// Times are counted here: the encoder does not know of the silence that it was spared.
void AudioEncoder::handOver(std::span<const std::byte> data, std::uint32_t duration) {
    handler_({nextDecodeTime_, 0, duration, true}, data);
    nextDecodeTime_ += duration;
}

}  // namespace kelvo
