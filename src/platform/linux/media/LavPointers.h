#pragma once

#include "base/KVError.h"
#include "platform/MediaErrors.h"

#include <memory>
#include <string>
#include <string_view>

extern "C" {
#include <libavcodec/avcodec.h>
#include <libavformat/avformat.h>
#include <libavutil/opt.h>
#include <libswresample/swresample.h>
}

namespace kelvo {

/// Frees what the libav libraries allocate, each kind in its own way.
struct LavDeleter {
    void operator()(AVCodecContext* context) const { avcodec_free_context(&context); }
    void operator()(AVFormatContext* context) const { avformat_close_input(&context); }
    void operator()(AVFrame* frame) const { av_frame_free(&frame); }
    void operator()(AVPacket* packet) const { av_packet_free(&packet); }
    void operator()(SwrContext* context) const { swr_free(&context); }
};

using CodecContextPointer = std::unique_ptr<AVCodecContext, LavDeleter>;
using FormatContextPointer = std::unique_ptr<AVFormatContext, LavDeleter>;
using FramePointer = std::unique_ptr<AVFrame, LavDeleter>;
using PacketPointer = std::unique_ptr<AVPacket, LavDeleter>;
using ResamplerPointer = std::unique_ptr<SwrContext, LavDeleter>;

/// The most that libav may allocate at once. A picture of 8192x8192 takes 100 MB and the index of a movie of
/// a day at 60 frames a second 124 MB; more is asked for only by a file that lies about how much it holds.
constexpr std::size_t kMostLavBytes = std::size_t{256} << 20;

/// The error for what a libav function returned: in the POSIX domain when it is an errno value, else with
/// `code`.
KVError lavError(int result, MediaErrorCode code, std::string_view what);

/// Sets the libraries up for this process: their own messages are dropped, as every failure comes back as an
/// error, and no single allocation of theirs exceeds kMostLavBytes. Called before their first use;
/// thread-safe.
void prepareLav();

}  // namespace kelvo
