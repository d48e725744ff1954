#include "platform/linux/media/VideoEncoder.h"

#include "base/KVLog.h"
#include "platform/linux/media/H264Bitstream.h"

#include <algorithm>
#include <cmath>
#include <thread>
#include <vector>

namespace kelvo {
namespace {

/// Best first. Those in hardware take frames from memory and open only where their device is.
constexpr const char* kHardwareEncoders[] = {"h264_nvenc", "h264_v4l2m2m", "h264_omx"};
constexpr const char* kSoftwareEncoder = "libx264";

/// More threads cut a live frame into more slices than is good for the picture.
constexpr unsigned kMostLiveThreads = 4;

int profileNumber(VideoSettings::Profile profile) {
    switch (profile) {
        case VideoSettings::Profile::baseline:
            return FF_PROFILE_H264_CONSTRAINED_BASELINE;
        case VideoSettings::Profile::main:
            return FF_PROFILE_H264_MAIN;
        case VideoSettings::Profile::high:
            break;
    }
    return FF_PROFILE_H264_HIGH;
}

const char* profileName(VideoSettings::Profile profile) {
    switch (profile) {
        case VideoSettings::Profile::baseline:
            return "baseline";
        case VideoSettings::Profile::main:
            return "main";
        case VideoSettings::Profile::high:
            break;
    }
    return "high";
}

void setPrivateOption(AVCodecContext& context, const char* name, const std::string& value) {
    // An encoder without this option does what it does without it.
    static_cast<void>(av_opt_set(context.priv_data, name, value.c_str(), 0));
}

void configureSoftware(AVCodecContext& context, const VideoSettings& settings,
                       VideoEncoder::Purpose purpose) {
    setPrivateOption(context, "preset", "superfast");
    setPrivateOption(context, "profile", profileName(settings.profile));
    if (purpose == VideoEncoder::Purpose::live) {
        setPrivateOption(context, "tune", "zerolatency");
        context.thread_count =
            static_cast<int>(std::clamp(std::thread::hardware_concurrency(), 1U, kMostLiveThreads));
    } else {
        context.thread_count = 0;
    }
    if (!settings.averageBitRate) {
        setPrivateOption(context, "crf", std::to_string(settings.constantQuality));
    }
}

CodecContextPointer configuredContext(const AVCodec& codec, const VideoSettings& settings,
                                      VideoEncoder::Purpose purpose, const VideoEncoder::Source& source) {
    CodecContextPointer context(avcodec_alloc_context3(&codec));
    if (!context) return nullptr;
    context->width = settings.width;
    context->height = settings.height;
    context->pix_fmt = source.pixelFormat;
    context->time_base = {1, static_cast<int>(VideoEncoder::kTimescale)};
    context->framerate = av_d2q(settings.frameRate, 100000);
    context->bit_rate = settings.averageBitRate.value_or(0);
    context->gop_size = settings.maxKeyFrameInterval;
    context->max_b_frames = 0;
    context->profile = profileNumber(settings.profile);
    context->color_primaries = source.primaries;
    context->color_trc = source.transfer;
    context->colorspace = source.matrix;
    context->color_range = source.range;
    context->flags |= AV_CODEC_FLAG_GLOBAL_HEADER;
    setPrivateOption(*context, "forced-idr", "1");
    if (std::string_view(codec.name) == kSoftwareEncoder) configureSoftware(*context, settings, purpose);
    return context;
}

std::vector<const char*> candidates(VideoEncoder::Purpose purpose) {
    std::vector<const char*> names;
    if (purpose == VideoEncoder::Purpose::live) {
        names.assign(std::begin(kHardwareEncoders), std::end(kHardwareEncoders));
    }
    names.push_back(kSoftwareEncoder);
    return names;
}

}  // namespace

VideoEncoder::VideoEncoder(CodecContextPointer context, const VideoSettings& settings)
    : context_(std::move(context)),
      packet_(av_packet_alloc()),
      frameDuration_(static_cast<std::uint32_t>(std::lround(kTimescale / settings.frameRate))),
      longestKeyInterval_(
          static_cast<std::int64_t>(std::min(settings.maxKeyFrameIntervalSeconds, 1e9) * kTimescale)) {}

Result<std::unique_ptr<VideoEncoder>> VideoEncoder::open(const VideoSettings& settings, Purpose purpose,
                                                         const Source& source) {
    prepareLav();
    for (const char* name : candidates(purpose)) {
        const AVCodec* codec = avcodec_find_encoder_by_name(name);
        CodecContextPointer context =
            codec == nullptr ? nullptr : configuredContext(*codec, settings, purpose, source);
        if (!context || avcodec_open2(context.get(), codec, nullptr) < 0) continue;
        // The constructor is private, so that every encoder is open.
        std::unique_ptr<VideoEncoder> encoder(new VideoEncoder(std::move(context), settings));
        if (encoder->packet_ && encoder->findConfiguration()) return encoder;
    }
    return mediaError(kMediaErrorEncoderUnavailable, "no H.264 encoder takes these settings");
}

bool VideoEncoder::findConfiguration() {
    configuration_ = avcConfiguration(
        std::as_bytes(std::span(context_->extradata, static_cast<std::size_t>(context_->extradata_size))));
    return !configuration_.empty();
}

OptionalError VideoEncoder::encode(AVFrame& frame, std::int64_t time, const SampleHandler& handler) {
    frame.pts = time;
    const bool keyIsDue = longestKeyInterval_ > 0 && time - lastKeyTime_ >= longestKeyInterval_;
    frame.pict_type = keyIsDue ? AV_PICTURE_TYPE_I : AV_PICTURE_TYPE_NONE;
    return send(&frame, handler);
}

OptionalError VideoEncoder::flush(const SampleHandler& handler) {
    return send(nullptr, handler);
}

OptionalError VideoEncoder::send(const AVFrame* frame, const SampleHandler& handler) {
    int result = avcodec_send_frame(context_.get(), frame);
    while (result >= 0) {
        result = avcodec_receive_packet(context_.get(), packet_.get());
        if (result < 0) break;
        const bool isKeyFrame = (packet_->flags & AV_PKT_FLAG_KEY) != 0;
        if (isKeyFrame) lastKeyTime_ = packet_->pts;
        sample_.clear();
        appendWithSizes(std::as_bytes(std::span(packet_->data, static_cast<std::size_t>(packet_->size))),
                        sample_);
        handler({packet_->pts, 0, frameDuration_, isKeyFrame}, sample_);
        av_packet_unref(packet_.get());
    }
    if (result == AVERROR(EAGAIN) || result == AVERROR_EOF) return std::nullopt;
    return lavError(result, kMediaErrorEncodingFailed, "video encoder");
}

}  // namespace kelvo
