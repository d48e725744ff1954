#include "platform/linux/media/FrameConverter.h"

#include <algorithm>
#include <cmath>
#include <cstring>

#include <libyuv.h>

namespace kelvo {
namespace {

/// Sides and positions of pictures are even, as their colour planes have half the size.
int even(double number) {
    return static_cast<int>(std::lround(number / 2)) * 2;
}

int stride(const VideoSurface& surface) {
    return static_cast<int>(surface.geometry().bytesPerRow);
}

const std::uint8_t* pixels(const VideoSurface& surface) {
    return reinterpret_cast<const std::uint8_t*>(surface.pixels().data());
}

}  // namespace

AVFrame* FrameConverter::convert(const VideoSurface& surface) {
    if (!prepareFrame()) return nullptr;
    const int width = static_cast<int>(surface.width());
    const int height = static_cast<int>(surface.height());
    // An odd side was rounded up to even: such a picture is not scaled by half a pixel.
    const bool isWholeFrame = width + width % 2 == width_ && height + height % 2 == height_;
    const Rectangle target = isWholeFrame ? Rectangle{0, 0, width, height} : fit(width, height);
    if (target != filled_) blacken();
    filled_ = target;
    if (isWholeFrame) {
        libyuv::ARGBToI420(pixels(surface), stride(surface), frame_->data[0], frame_->linesize[0],
                           frame_->data[1], frame_->linesize[1], frame_->data[2], frame_->linesize[2], width,
                           height);
    } else {
        scaleInto(surface, target);
    }
    return frame_.get();
}

/// Makes the frame when there is none, or one of its own when the encoder still reads the last.
bool FrameConverter::prepareFrame() {
    if (frame_) return av_frame_make_writable(frame_.get()) >= 0;
    FramePointer frame(av_frame_alloc());
    if (!frame) return false;
    frame->format = AV_PIX_FMT_YUV420P;
    frame->width = width_;
    frame->height = height_;
    frame->color_primaries = AVCOL_PRI_SMPTE170M;
    frame->color_trc = AVCOL_TRC_SMPTE170M;
    frame->colorspace = AVCOL_SPC_SMPTE170M;
    frame->color_range = AVCOL_RANGE_MPEG;
    if (av_frame_get_buffer(frame.get(), 0) < 0) return false;
    frame_ = std::move(frame);
    return true;
}

FrameConverter::Rectangle FrameConverter::fit(int width, int height) const {
    const double scale = std::min(static_cast<double>(width_) / width, static_cast<double>(height_) / height);
    Rectangle target;
    target.width = std::clamp(even(width * scale), 2, width_);
    target.height = std::clamp(even(height * scale), 2, height_);
    target.x = (width_ - target.width) / 4 * 2;
    target.y = (height_ - target.height) / 4 * 2;
    return target;
}

void FrameConverter::blacken() {
    constexpr std::uint8_t kBlack = 16;
    constexpr std::uint8_t kNoColour = 128;
    libyuv::SetPlane(frame_->data[0], frame_->linesize[0], width_, height_, kBlack);
    for (int plane = 1; plane < 3; ++plane)
        libyuv::SetPlane(frame_->data[plane], frame_->linesize[plane], width_ / 2, height_ / 2, kNoColour);
}

/// Scales after the conversion, which leaves less than half of the bytes to scale.
void FrameConverter::scaleInto(const VideoSurface& surface, const Rectangle& target) {
    const int width = static_cast<int>(surface.width());
    const int height = static_cast<int>(surface.height());
    const int halfWidth = (width + 1) / 2;
    const std::size_t lumaSize = static_cast<std::size_t>(width) * static_cast<std::size_t>(height);
    const std::size_t chromaSize =
        static_cast<std::size_t>(halfWidth) * static_cast<std::size_t>((height + 1) / 2);
    unscaled_.resize(lumaSize + 2 * chromaSize);
    std::uint8_t* y = unscaled_.data();
    std::uint8_t* u = y + lumaSize;
    std::uint8_t* v = u + chromaSize;
    libyuv::ARGBToI420(pixels(surface), stride(surface), y, width, u, halfWidth, v, halfWidth, width, height);
    const auto place = [&](int plane, int x, int row) {
        return frame_->data[plane] + row * frame_->linesize[plane] + x;
    };
    libyuv::I420Scale(y, width, u, halfWidth, v, halfWidth, width, height, place(0, target.x, target.y),
                      frame_->linesize[0], place(1, target.x / 2, target.y / 2), frame_->linesize[1],
                      place(2, target.x / 2, target.y / 2), frame_->linesize[2], target.width, target.height,
                      libyuv::kFilterBox);
}

}  // namespace kelvo
