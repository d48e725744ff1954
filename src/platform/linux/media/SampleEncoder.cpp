#include "platform/linux/media/SampleEncoder.h"

#include "base/KVLog.h"
#include "platform/linux/media/AudioAligner.h"
#include "platform/linux/media/AudioEncoder.h"
#include "platform/linux/media/FrameConverter.h"
#include "platform/linux/media/SoundCutter.h"
#include "platform/linux/media/VideoEncoder.h"

#include <cerrno>
#include <optional>

namespace kelvo {
namespace {

class VideoSampleEncoder : public SampleEncoder {
  public:
    Result<TrackFormat> open(const Dictionary& outputSettings, SampleHandler handler) override;
    Work take(const SampleBufferRef& sample, const MovieTimeline& timeline) override;
    OptionalError flush(const MovieTimeline&) override { return encoder_->flush(handler_); }

  private:
    SampleHandler handler_;
    std::unique_ptr<VideoEncoder> encoder_;
    std::optional<FrameConverter> converter_;
    std::int64_t lastTime_ = -1;
};

Result<TrackFormat> VideoSampleEncoder::open(const Dictionary& outputSettings, SampleHandler handler) {
    const auto settings = VideoSettings::fromOutputSettings(outputSettings);
    if (!settings) return settings.error();
    auto encoder = VideoEncoder::open(*settings, VideoEncoder::Purpose::live, {});
    if (!encoder) return encoder.error();
    encoder_ = std::move(*encoder);
    converter_.emplace(settings->width, settings->height);
    handler_ = std::move(handler);
    TrackFormat format;
    format.timescale = VideoEncoder::kTimescale;
    format.codecConfiguration = encoder_->configuration();
    format.width = static_cast<std::uint16_t>(settings->width);
    format.height = static_cast<std::uint16_t>(settings->height);
    format.hasOwnColours = true;
    return format;
}

/// Converts at once: what waits for the encoder then takes less than half of the memory, and the surface is
/// free for the next frame of the screen.
SampleEncoder::Work VideoSampleEncoder::take(const SampleBufferRef& sample, const MovieTimeline& timeline) {
    const MediaTime time =
        (sample->presentationTime() - timeline.start()).convertedTo(VideoEncoder::kTimescale);
    // Frames closer than the file's unit fall on one time; so does a clock that stands still.
    if (!time.isValid() || time.value <= lastTime_) return nullptr;
    lastTime_ = time.value;
    const std::shared_ptr<AVFrame> frame = converter_->convert(*sample->surface());
    return [this, frame, time]() -> OptionalError {
        if (!frame) return KVError::posix(ENOMEM, "video frame");
        return encoder_->encode(*frame, time.value, handler_);
    };
}

class AudioSampleEncoder : public SampleEncoder {
  public:
    Result<TrackFormat> open(const Dictionary& outputSettings, SampleHandler handler) override;
    Work take(const SampleBufferRef& sample, const MovieTimeline& timeline) override {
        return [this, sample, &timeline] { return encode(*sample, timeline); };
    }
    OptionalError flush(const MovieTimeline& timeline) override;

  private:
    OptionalError encode(const SampleBuffer& sample, const MovieTimeline& timeline);

    std::unique_ptr<AudioEncoder> encoder_;
    std::optional<AudioAligner> aligner_;
    std::optional<SoundCutter> cutter_;
    MediaTime start_;
    bool complained_ = false;
};

Result<TrackFormat> AudioSampleEncoder::open(const Dictionary& outputSettings, SampleHandler handler) {
    const auto settings = AudioSettings::fromOutputSettings(outputSettings);
    if (!settings) return settings.error();
    auto encoder = AudioEncoder::open(*settings, std::move(handler));
    if (!encoder) return encoder.error();
    encoder_ = std::move(*encoder);
    aligner_.emplace(settings->sampleRate, *encoder_);
    cutter_.emplace([this](PcmBlock block, const MediaTime& sourceTime, AudioAligner::Joint joint) {
        return aligner_->add(std::move(block), (sourceTime - start_).seconds(), joint);
    });
    return encoder_->trackFormat();
}

OptionalError AudioSampleEncoder::encode(const SampleBuffer& sample, const MovieTimeline& timeline) {
    start_ = timeline.start();
    auto block = readPcm(sample);
    if (block) return cutter_->add(std::move(*block), sample.presentationTime(), timeline);
    if (!complained_) KVLogError("dropping audio: %s", block.error().localizedFailureReason().c_str());
    complained_ = true;
    return std::nullopt;
}

OptionalError AudioSampleEncoder::flush(const MovieTimeline& timeline) {
    if (OptionalError error = cutter_->flush(timeline)) return error;
    if (OptionalError error = aligner_->flush()) return error;
    return encoder_->flush();
}

}  // namespace

std::unique_ptr<SampleEncoder> makeSampleEncoder(MediaType type) {
    if (type == MediaType::video) return std::make_unique<VideoSampleEncoder>();
    return std::make_unique<AudioSampleEncoder>();
}

}  // namespace kelvo
