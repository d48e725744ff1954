#include "base/SampleBuffer.h"

#include <algorithm>

namespace kelvo {

SampleBufferRef SampleBuffer::video(VideoSurfaceRef surface, const TimingRecord& timing) {
    SampleBufferRef sample(new SampleBuffer);
    sample->surface_ = std::move(surface);
    sample->timing_ = {timing};
    sample->captureTime_ = timing.presentationTime;
    return sample;
}

SampleBufferRef SampleBuffer::audio(const AudioFormatRecord& format, Bytes bytes, std::int64_t sampleCount,
                                    const TimingRecord& timing) {
    SampleBufferRef sample(new SampleBuffer);
    sample->format_ = format;
    sample->audioBytes_ = std::make_shared<Bytes>(std::move(bytes));
    sample->sampleCount_ = sampleCount;
    sample->timing_ = {timing};
    sample->captureTime_ = timing.presentationTime;
    return sample;
}

std::span<const std::byte> SampleBuffer::audioBytes() const {
    if (!audioBytes_) return {};
    return *audioBytes_;
}

SampleBufferRef SampleBuffer::copyWithTiming(std::span<const TimingRecord> timing) const {
    if (timing.empty()) return nullptr;
    SampleBufferRef copy(new SampleBuffer(*this));
    copy->timing_.assign(timing.begin(), timing.end());
    return copy;
}

void SampleBuffer::silence() {
    if (audioBytes_) std::fill(audioBytes_->begin(), audioBytes_->end(), std::byte{0});
}

}  // namespace kelvo
