#include "ipc/KVBroadcastConfigurationCoding.h"

namespace kelvo {
namespace {

constexpr std::string_view kClipDurationKey = "clipDuration";
constexpr std::string_view kPropertiesKey = "videoCompressionProperties";

}  // namespace

void KVBroadcastConfigurationCoding::encodeWithCoder(const KVBroadcastConfiguration& configuration,
                                                     KVCoder& coder) {
    coder.encode(kClipDurationKey, configuration.clipDuration());
    const auto& properties = configuration.videoCompressionProperties();
    if (properties && !properties->empty()) coder.encode(kPropertiesKey, *properties);
}

KVBroadcastConfiguration KVBroadcastConfigurationCoding::initWithCoder(const KVCoder& coder) {
    KVBroadcastConfiguration configuration;
    const Value* duration = coder.decode(kClipDurationKey);
    if (duration != nullptr && duration->as<bool>() == nullptr)
        configuration.setClipDuration(duration->asDouble().value_or(0));
    const Value* properties = coder.decode(kPropertiesKey);
    if (properties != nullptr && properties->asDictionary() != nullptr)
        configuration.setVideoCompressionProperties(*properties->asDictionary());
    return configuration;
}

}  // namespace kelvo
