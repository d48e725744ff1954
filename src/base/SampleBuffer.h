#pragma once

#include "base/MediaRecords.h"
#include "base/VideoSurface.h"

#include <cstdint>
#include <memory>
#include <span>
#include <vector>

namespace kelvo {

class SampleBuffer;
using SampleBufferRef = std::shared_ptr<SampleBuffer>;

/// One timed media sample: a video frame, or a buffer of audio. Frames and audio bytes are shared between
/// copies; the timing is each copy's own. Not changed once it is handed on, but for `silence`; then
/// thread-safe.
class SampleBuffer {
  public:
    /// What a sample is, with the numbers that clients and extensions see.
    enum class Type : std::int64_t { video = 1, applicationAudio = 2, microphone = 3 };

    /// A video frame.
    static SampleBufferRef video(VideoSurfaceRef surface, const TimingRecord& timing);

    /// `sampleCount` audio frames in `bytes`, laid out as `format` says. The timing's duration is the whole
    /// buffer's.
    static SampleBufferRef audio(const AudioFormatRecord& format, Bytes bytes, std::int64_t sampleCount,
                                 const TimingRecord& timing);

    bool isVideo() const { return surface_ != nullptr; }
    const VideoSurfaceRef& surface() const { return surface_; }
    const AudioFormatRecord& audioFormat() const { return format_; }
    std::span<const std::byte> audioBytes() const;
    std::int64_t sampleCount() const { return sampleCount_; }

    MediaTime duration() const { return timing_.front().duration; }
    MediaTime presentationTime() const { return timing_.front().presentationTime; }
    MediaTime decodeTime() const { return timing_.front().decodeTime; }

    /// When it was captured, on the host's clock: the presentation time that it was made with. Copies with
    /// other times keep it.
    MediaTime captureTime() const { return captureTime_; }

    /// One record for the whole buffer, or one for each of its samples; never empty.
    std::span<const TimingRecord> timing() const { return timing_; }

    /// The same content with other times; none when `timing` is empty.
    SampleBufferRef copyWithTiming(std::span<const TimingRecord> timing) const;

    /// Overwrites the audio with zero bytes, for every copy that shares it. Before the sample is handed on.
    void silence();

  private:
    SampleBuffer() = default;

    VideoSurfaceRef surface_;
    AudioFormatRecord format_;
    std::shared_ptr<Bytes> audioBytes_;
    std::int64_t sampleCount_ = 1;
    std::vector<TimingRecord> timing_;
    MediaTime captureTime_;
};

}  // namespace kelvo
