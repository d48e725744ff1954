#include "media/GapSample.h"

namespace kelvo {
namespace {

constexpr double kGapSampleRate = 44100.0;
constexpr std::int32_t kGapTimescale = 44100;

}  // namespace

SampleBufferRef makeGapSample(const AudioFormatRecord& description, double seconds, const MediaTime& start) {
    if (!(seconds > 0 && seconds <= kLongestGapSeconds) || description.framesPerPacket == 0) return nullptr;
    const std::uint64_t bytesPerSample = description.bytesPerFrame == 0 ? 1 : description.bytesPerPacket;
    const auto sampleCount =
        static_cast<std::uint64_t>(seconds * kGapSampleRate / description.framesPerPacket);
    const TimingRecord timing{MediaTime::fromSeconds(seconds, kGapTimescale), start, MediaTime::invalid()};
    return SampleBuffer::audio(description, Bytes(bytesPerSample * sampleCount),
                               static_cast<std::int64_t>(sampleCount), timing);
}

}  // namespace kelvo
