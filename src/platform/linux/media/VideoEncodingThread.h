#pragma once

#include "base/SerialQueue.h"
#include "platform/linux/media/VideoEncoder.h"

#include <condition_variable>
#include <memory>
#include <mutex>

namespace kelvo {

/// Lets a video encoder work on a thread of its own, so that whoever makes the frames goes on with the next
/// ones meanwhile. Few frames wait in between. Caller's thread.
class VideoEncodingThread {
  public:
    /// `handler` runs on that thread.
    VideoEncodingThread(std::unique_ptr<VideoEncoder> encoder, VideoEncoder::SampleHandler handler);
    /// Drops the frames that wait.
    ~VideoEncodingThread();
    VideoEncodingThread(const VideoEncodingThread&) = delete;
    VideoEncodingThread& operator=(const VideoEncodingThread&) = delete;

    /// Takes the content out of `frame` to encode it at `time`, later than the frame before. Waits while too
    /// many frames do. Fails when an earlier frame failed.
    OptionalError encode(AVFrame& frame, std::int64_t time);
    /// Hands over everything that waits or is still inside. Nothing is encoded any more.
    OptionalError flush();

  private:
    void encodeNext(AVFrame& frame, std::int64_t time);

    const std::unique_ptr<VideoEncoder> encoder_;
    const VideoEncoder::SampleHandler handler_;
    std::mutex mutex_;
    std::condition_variable hasRoom_;
    int waiting_ = 0;
    bool isAbandoned_ = false;
    OptionalError error_;
    SerialQueue queue_;  // last, so that it ends before what its tasks use
};

}  // namespace kelvo
