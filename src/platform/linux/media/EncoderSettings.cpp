#include "platform/linux/media/EncoderSettings.h"

#include "base/KVLog.h"
#include "base/MediaRecords.h"
#include "platform/MediaErrors.h"
#include "platform/MediaSettings.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <functional>
#include <map>
#include <string>

namespace kelvo {
namespace {

/// What H.264's highest level holds: that many blocks of 16 by 16 pixels.
constexpr double kMostBlocks = 139264;
constexpr double kLargestSide = 16384;
constexpr std::int64_t kLowestBitRate = 16000;
constexpr std::int64_t kHighestBitRate = 240000000;

bool isEncodableSize(double width, double height) {
    const auto isSide = [](double side) {
        return side >= 2 && side <= kLargestSide && std::fmod(side, 2) == 0;
    };
    return isSide(width) && isSide(height) && std::ceil(width / 16) * std::ceil(height / 16) <= kMostBlocks;
}

double numberUnder(const Dictionary& settings, std::string_view key) {
    const Value* value = settings.find(key);
    return value == nullptr ? 0 : value->asDouble().value_or(0);
}

/// Takes one property into the settings; false when the value is of a wrong type or out of all range.
using PropertyReader = std::function<bool(VideoSettings&, const Value&)>;

bool readBitRate(VideoSettings& settings, const Value& value) {
    const auto rate = value.asInteger();
    if (!rate) return false;
    settings.averageBitRate.reset();
    if (*rate > 0) settings.averageBitRate = std::clamp(*rate, kLowestBitRate, kHighestBitRate);
    return true;
}

bool readFrameRate(VideoSettings& settings, const Value& value) {
    const auto rate = value.asDouble();
    if (!rate || !(*rate > 0)) return false;
    settings.frameRate = std::clamp(*rate, 1.0, 240.0);
    return true;
}

bool readKeyFrameInterval(VideoSettings& settings, const Value& value) {
    const auto interval = value.asInteger();
    if (!interval || *interval < 1) return false;
    settings.maxKeyFrameInterval = static_cast<int>(std::min<std::int64_t>(*interval, 100000));
    return true;
}

bool readKeyFrameDuration(VideoSettings& settings, const Value& value) {
    const auto seconds = value.asDouble();
    if (!seconds || !(*seconds >= 0)) return false;
    settings.maxKeyFrameIntervalSeconds = *seconds;
    return true;
}

bool readProfile(VideoSettings& settings, const Value& value) {
    static const std::map<std::string_view, VideoSettings::Profile> kProfiles{
        {kProfileLevelH264Baseline, VideoSettings::Profile::baseline},
        {kProfileLevelH264Main, VideoSettings::Profile::main},
        {kProfileLevelH264High, VideoSettings::Profile::high}};
    const std::string* name = value.asString();
    const auto profile = name == nullptr ? kProfiles.end() : kProfiles.find(*name);
    if (profile == kProfiles.end()) return false;
    settings.profile = profile->second;
    return true;
}

void readCompressionProperties(VideoSettings& settings, const Dictionary& properties) {
    static const std::map<std::string_view, PropertyReader> kReaders{
        {kAverageBitRateKey, readBitRate},
        {kExpectedSourceFrameRateKey, readFrameRate},
        {kMaxKeyFrameIntervalKey, readKeyFrameInterval},
        {kMaxKeyFrameIntervalDurationKey, readKeyFrameDuration},
        {kProfileLevelKey, readProfile}};
    for (const auto& [key, value] : properties) {
        const auto reader = kReaders.find(key);
        if (reader == kReaders.end()) {
            KVLog("ignoring unknown video compression property %s", key.c_str());
        } else if (!reader->second(settings, value)) {
            KVLog("ignoring video compression property %s = %s", key.c_str(), value.description().c_str());
        }
    }
}

/// Whether the settings ask for another channel layout than left and right.
bool asksForOtherLayout(const Dictionary& settings) {
    const Value* layout = settings.find(kAudioChannelLayoutKey);
    if (layout == nullptr) return false;
    const Bytes* record = layout->as<Bytes>();
    std::uint32_t tag = 0;
    if (record == nullptr || record->size() < sizeof(tag)) return true;
    std::memcpy(&tag, record->data(), sizeof(tag));
    return tag != kStereoLayoutTag;
}

}  // namespace

Result<VideoSettings> VideoSettings::fromOutputSettings(const Dictionary& settings) {
    const Value* codec = settings.find(kVideoCodecKey);
    if (codec == nullptr || codec->asString() == nullptr || *codec->asString() != kVideoCodecH264) {
        return mediaError(kMediaErrorUnsupportedFormat, "no such video codec");
    }
    const double width = numberUnder(settings, kVideoWidthKey);
    const double height = numberUnder(settings, kVideoHeightKey);
    if (!isEncodableSize(width, height))
        return mediaError(kMediaErrorUnsupportedFormat, "no such video size");
    VideoSettings result;
    result.width = static_cast<int>(width);
    result.height = static_cast<int>(height);
    const Value* properties = settings.find(kVideoCompressionPropertiesKey);
    if (properties != nullptr && properties->asDictionary() != nullptr) {
        readCompressionProperties(result, *properties->asDictionary());
    }
    return result;
}

Result<AudioSettings> AudioSettings::fromOutputSettings(const Dictionary& settings) {
    if (numberUnder(settings, kAudioFormatKey) != kAACFormat ||
        numberUnder(settings, kAudioChannelCountKey) != 2 || asksForOtherLayout(settings)) {
        return mediaError(kMediaErrorUnsupportedFormat, "audio is written as stereo AAC only");
    }
    AudioSettings result;
    const double sampleRate = numberUnder(settings, kAudioSampleRateKey);
    const double bitRate = numberUnder(settings, kAudioBitRateKey);
    if (!(sampleRate >= 8000 && sampleRate <= 96000) || !(bitRate >= 1 && bitRate <= 512000)) {
        return mediaError(kMediaErrorUnsupportedFormat, "no such audio rate");
    }
    result.sampleRate = static_cast<int>(sampleRate);
    result.bitRate = static_cast<std::int64_t>(bitRate);
    return result;
}

}  // namespace kelvo
