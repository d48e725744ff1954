#include "media/MovieOutputSettings.h"

#include "base/MediaRecords.h"
#include "platform/MediaSettings.h"

#include <array>
#include <cmath>
#include <cstring>
#include <string>

namespace kelvo {
namespace {

constexpr double kLargeSide = 1920;
constexpr std::int64_t kTabletBitRate = 7000000;
constexpr std::int64_t kLargeBitRate = 5000000;
constexpr std::int64_t kSmallBitRate = 3000000;
constexpr int kExpectedFrameRate = 60;
constexpr int kMaxKeyFrameInterval = 60;
constexpr double kAudioSampleRate = 44100;
constexpr int kAudioBitRate = 128000;

/// The integer part of `side`, rounded up to an even number. Stays a double throughout: a client's window may
/// have any size.
double evenSide(double side) {
    const double whole = std::trunc(side);
    return std::fmod(whole, 2) == 0 ? whole : whole + 1;
}

Dictionary::Entry entry(std::string_view key, Value value) {
    return {std::string(key), std::move(value)};
}

/// The record that describes a channel layout by its tag: tag, channel bitmap, count of channel descriptions,
/// and room for one description.
Bytes layoutRecord(std::uint32_t layoutTag) {
    Bytes record(32, std::byte{0});
    std::memcpy(record.data(), &layoutTag, sizeof(layoutTag));
    return record;
}

}  // namespace

std::int64_t defaultVideoBitRate(DeviceIdiom idiom, const Size& windowSize) {
    if (idiom == DeviceIdiom::tablet) return kTabletBitRate;
    const bool isLarge = windowSize.width >= kLargeSide || windowSize.height >= kLargeSide;
    return isLarge ? kLargeBitRate : kSmallBitRate;
}

Dictionary videoCompressionProperties(std::int64_t bitRate) {
    return {entry(kExpectedSourceFrameRateKey, kExpectedFrameRate),
            entry(kProfileLevelKey, kProfileLevelH264High), entry(kAverageBitRateKey, bitRate),
            entry(kMaxKeyFrameIntervalKey, kMaxKeyFrameInterval)};
}

Dictionary videoOutputSettings(const Size& windowSize, const Dictionary& compressionProperties) {
    return {entry(kVideoCodecKey, kVideoCodecH264), entry(kVideoWidthKey, evenSide(windowSize.width)),
            entry(kVideoHeightKey, evenSide(windowSize.height)),
            entry(kVideoCompressionPropertiesKey, compressionProperties)};
}

Dictionary audioOutputSettings() {
    return {entry(kAudioFormatKey, kAACFormat), entry(kAudioChannelCountKey, 2),
            entry(kAudioSampleRateKey, kAudioSampleRate),
            entry(kAudioChannelLayoutKey, layoutRecord(kStereoLayoutTag)),
            entry(kAudioBitRateKey, kAudioBitRate)};
}

}  // namespace kelvo
