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

FramePointer FrameConverter::convert(const VideoSurface& surface) {
    Canvas* const canvas = freeCanvas();
    if (canvas == nullptr) return nullptr;
    const AVFrame& frame = *canvas->frame;
    const int width = static_cast<int>(surface.width());
    const int height = static_cast<int>(surface.height());
    // An odd side was rounded up to even: such a picture is not scaled by half a pixel.
    const bool isWholeFrame = width + width % 2 == width_ && height + height % 2 == height_;
    const Rectangle target = isWholeFrame ? Rectangle{0, 0, width, height} : fit(width, height);
    if (target != canvas->filled) blacken(frame);
    canvas->filled = target;
    if (isWholeFrame) {
        libyuv::ARGBToI420(pixels(surface), stride(surface), frame.data[0], frame.linesize[0], frame.data[1],
                           frame.linesize[1], frame.data[2], frame.linesize[2], width, height);
    } else {
        scaleInto(frame, surface, target);
    }
    return FramePointer(av_frame_clone(&frame));
}

/// One that nobody else holds, made when there is none. There are as many as were ever held at a time.
FrameConverter::Canvas* FrameConverter::freeCanvas() {
    const auto isFree = [](const Canvas& canvas) { return av_frame_is_writable(canvas.frame.get()) != 0; };
    const auto free = std::ranges::find_if(canvases_, isFree);
    if (free != canvases_.end()) return &*free;
    FramePointer frame = makeFrame();
    if (!frame) return nullptr;
    canvases_.push_back({std::move(frame), {}});
    return &canvases_.back();
}

FramePointer FrameConverter::makeFrame() const {
    FramePointer frame(av_frame_alloc());
    if (!frame) return nullptr;
    frame->format = AV_PIX_FMT_YUV420P;
    frame->width = width_;
    frame->height = height_;
    frame->color_primaries = AVCOL_PRI_SMPTE170M;
    frame->color_trc = AVCOL_TRC_SMPTE170M;
    frame->colorspace = AVCOL_SPC_SMPTE170M;
    frame->color_range = AVCOL_RANGE_MPEG;
    return av_frame_get_buffer(frame.get(), 0) < 0 ? nullptr : std::move(frame);
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

void FrameConverter::blacken(const AVFrame& frame) const {
    constexpr std::uint8_t kBlack = 16;
    constexpr std::uint8_t kNoColour = 128;
    libyuv::SetPlane(frame.data[0], frame.linesize[0], width_, height_, kBlack);
    for (int plane = 1; plane < 3; ++plane)
        libyuv::SetPlane(frame.data[plane], frame.linesize[plane], width_ / 2, height_ / 2, kNoColour);
}

/// Scales after the conversion, which leaves less than half of the bytes to scale.
void FrameConverter::scaleInto(const AVFrame& frame, const VideoSurface& surface, const Rectangle& target) {
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
        return frame.data[plane] + row * frame.linesize[plane] + x;
    };
    libyuv::I420Scale(y, width, u, halfWidth, v, halfWidth, width, height, place(0, target.x, target.y),
                      frame.linesize[0], place(1, target.x / 2, target.y / 2), frame.linesize[1],
                      place(2, target.x / 2, target.y / 2), frame.linesize[2], target.width, target.height,
                      libyuv::kFilterBox);
}

}  // namespace kelvo
