#include "platform/linux/media/VideoEncodingThread.h"

#include <cerrno>

namespace kelvo {
namespace {

/// Enough to cover that some frames take longer than others to decode.
constexpr int kMostWaitingFrames = 4;

}  // namespace

VideoEncodingThread::VideoEncodingThread(std::unique_ptr<VideoEncoder> encoder,
                                         VideoEncoder::SampleHandler handler)
    : encoder_(std::move(encoder)),
      handler_(std::move(handler)),
      queue_("com.quillon.KelvoKit.MasterEncoder") {}

VideoEncodingThread::~VideoEncodingThread() {
    std::lock_guard lock(mutex_);
    isAbandoned_ = true;
}

OptionalError VideoEncodingThread::encode(AVFrame& frame, std::int64_t time) {
    const std::shared_ptr<AVFrame> taken(av_frame_alloc(), LavDeleter());
    if (!taken) return KVError::posix(ENOMEM, "video frame");
    av_frame_move_ref(taken.get(), &frame);
    {
        std::unique_lock lock(mutex_);
        hasRoom_.wait(lock, [this] { return waiting_ < kMostWaitingFrames; });
        if (error_) return error_;
        ++waiting_;
    }
    queue_.async([this, taken, time] { encodeNext(*taken, time); });
    return std::nullopt;
}

void VideoEncodingThread::encodeNext(AVFrame& frame, std::int64_t time) {
    std::unique_lock lock(mutex_);
    if (!error_ && !isAbandoned_) {
        lock.unlock();
        const OptionalError error = encoder_->encode(frame, time, handler_);
        lock.lock();
        error_ = error;
    }
    --waiting_;
    hasRoom_.notify_one();
}

OptionalError VideoEncodingThread::flush() {
    // Behind every frame that waits.
    queue_.sync([this] {
        if (!error_) error_ = encoder_->flush(handler_);
    });
    return error_;
}

}  // namespace kelvo
