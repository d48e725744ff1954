#include "support/KVReportingAgent.h"

#include "base/KVLog.h"

#include <cmath>

namespace kelvo {
namespace {

// The report's format has these two as constants, whatever was captured.
constexpr std::int64_t kAppAudioCaptureRate = 2;
constexpr std::int64_t kMicCaptureRate = 43;

constexpr std::int32_t kClientType = 23;
constexpr std::int32_t kClientVersion = 1;
constexpr const char* kClientName = "KelvoKit";

std::int64_t roundedInSinglePrecision(double value) {
    return std::lround(static_cast<float>(value));
}

std::int64_t rounded(double value) {
    return std::lround(value);
}

}  // namespace

Dictionary KVReportingAgent::collectSummaryEventMetrics() const {
    const Size size = videoCaptureSize();
    return {
        {"ActiveDuration", roundedInSinglePrecision(activeDuration())},
        {"VideoCaptureWidth", rounded(size.width)},
        {"VideoCaptureHeight", rounded(size.height)},
        {"VideoCaptureRate", videoCaptureRate()},
        {"VideoFrameCount", videoFrameCount()},
        {"AppAudioCaptureRate", kAppAudioCaptureRate},
        {"AppAudioFrameCount", appAudioFrameCount()},
        {"MicCaptureRate", kMicCaptureRate},
        {"MicFrameCount", micFrameCount()},
        {"FrontCameraUsed", frontCameraUsed()},
        {"BackCameraUsed", backCameraUsed()},
        {"RecordedFileSize", recordedFileSize()},
        {"BroadcastExtensionBundleID", ""},
        {"ClientAppBundleID", ""},
        {"EndReason", endReason()},
    };
}

void KVReportingAgent::reportEventWithType(std::int32_t eventType, const std::optional<Dictionary>& payload) {
    if (!payload) {
        KVLog("KVReportingAgent: payloadDict cannot be null!");
        return;
    }
    KVLog("KVReportingAgent: reportingEvent:%d payload:%s", eventType, Value(*payload).description().c_str());
    AnalyticsMessage message;
    message.clientType = kClientType;
    message.clientVersion = kClientVersion;
    message.isBatchEvent = true;
    message.isUserInfoRequired = true;
    message.clientName = kClientName;
    message.serviceName = serviceName_;
    message.category = eventType;
    message.payload = *payload;
    if (const OptionalError error = analytics_->send(message))
        KVLog("eventType:%d error code %d.", eventType, static_cast<int>(error->code()));
}

}  // namespace kelvo
