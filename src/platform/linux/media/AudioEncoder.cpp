#include "platform/linux/media/AudioEncoder.h"

#include "platform/linux/media/AacBitstream.h"

#include <algorithm>

namespace kelvo {
namespace {

/// After this much silence each further frame of silence encodes to the same bytes.
constexpr std::int64_t kFramesUntilSteady = 8;

/// How much sound an encoder has to hear before it goes on exactly as one that has heard everything.
constexpr std::size_t kFramesOfMemory = 8;

/// One channel gets what the track gets, but for the bits of the second one.
AudioSettings settingsOfOneChannel(AudioSettings settings) {
    constexpr std::int64_t kFrameSize = 1024;
    constexpr std::int64_t kLeast = 8000;
    settings.bitRate =
        std::max(kLeast, settings.bitRate - kAacSecondChannelBits * settings.sampleRate / kFrameSize);
    return settings;
}

TrackFormat trackFormatFor(const AacEncoder& encoder, const AudioSettings& settings) {
    TrackFormat format;
    format.type = MediaType::audio;
    format.timescale = static_cast<std::uint32_t>(settings.sampleRate);
    format.lead = encoder.lead();
    format.codecConfiguration = aacStereoConfiguration(encoder.configuration());
    format.sampleRate = static_cast<std::uint32_t>(settings.sampleRate);
    format.channelCount = 2;
    format.bitRate = static_cast<std::uint32_t>(settings.bitRate);
    return format;
}

}  // namespace

Result<std::unique_ptr<AudioEncoder>> AudioEncoder::open(const AudioSettings& settings,
                                                         SampleHandler handler) {
    auto encoder = AacEncoder::open(settingsOfOneChannel(settings), 1);
    if (!encoder) return encoder.error();
    // The constructor is private, so that every encoder is open.
    return std::unique_ptr<AudioEncoder>(new AudioEncoder(settings, std::move(*encoder), std::move(handler)));
}

AudioEncoder::AudioEncoder(const AudioSettings& settings, AacEncoder encoder, SampleHandler handler)
    : settings_(settings),
      handler_(std::move(handler)),
      encoder_(std::move(encoder)),
      format_(trackFormatFor(encoder_, settings)),
      frameSize_(encoder_.frameSize()) {}

void AudioEncoder::begin(std::int64_t position) {
    nextDecodeTime_ = position - format_.lead;
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
        handOver(frameSize);
    return encodeZeros(count - (kFramesUntilSteady + repeated) * frameSize);
}

OptionalError AudioEncoder::encodeZeros(std::int64_t count) {
    const std::vector<float> zeros(static_cast<std::size_t>(count));
    return samples(zeros, zeros);
}

OptionalError AudioEncoder::encodeGathered() {
    if (encoder_.channelCount() == 1 && left_ != right_) {
        if (OptionalError error = encodeBothChannelsFromNowOn()) return error;
    }
    OptionalError error = encoder_.encode(left_, right_, packetHandler());
    if (encoder_.channelCount() == 1) {
        latest_.push_back(left_);
        if (latest_.size() > kFramesOfMemory) latest_.pop_front();
    }
    left_.clear();
    right_.clear();
    return error;
}

/// The new encoder first hears what the old one heard at last, so that its frames join the old one's: they
/// overlap, and their windows depend on the sound before.
OptionalError AudioEncoder::encodeBothChannelsFromNowOn() {
    auto encoder = AacEncoder::open(settings_, 2);
    if (!encoder) return encoder.error();
    const auto isHandedOver = [](std::span<const std::byte>, std::int64_t) { return OptionalError(); };
    for (const std::vector<float>& heard : latest_) {
        if (OptionalError error = encoder->encode(heard, heard, isHandedOver)) return error;
    }
    latest_.clear();
    encoder_ = std::move(*encoder);
    return std::nullopt;
}

OptionalError AudioEncoder::flush() {
    if (!left_.empty()) {
        if (OptionalError error = encodeGathered()) return error;
    }
    return encoder_.flush(packetHandler());
}

AacEncoder::PacketHandler AudioEncoder::packetHandler() {
    return [this](std::span<const std::byte> frame, std::int64_t duration) -> OptionalError {
        if (encoder_.channelCount() == 1) {
            auto stereo = aacStereoFrame(frame);
            if (!stereo) return stereo.error();
            lastSample_ = std::move(*stereo);
        } else {
            lastSample_.assign(frame.begin(), frame.end());
        }
        handOver(duration);
        return std::nullopt;
    };
}

/// Times are counted here: the encoder does not know of the silence that it was spared.
void AudioEncoder::handOver(std::int64_t duration) {
    handler_({nextDecodeTime_, 0, static_cast<std::uint32_t>(duration), true}, lastSample_);
    nextDecodeTime_ += duration;
}

}  // namespace kelvo
