#include "base/KVLog.h"
#include "session/KVRecordingSession.h"

namespace kelvo {
namespace {

constexpr std::uint32_t kBackCamera = 1;
constexpr std::uint32_t kFrontCamera = 2;

}  // namespace

std::string KVRecordingSession::_serviceNameForReporting() const {
    if (systemRecording_) return isBroadcasting_ ? "SystemBroadcast" : "SystemRecording";
    if (isBroadcasting_) return "InAppBroadcast";
    return captureRecording_ ? "InAppCapture" : "InAppRecording";
}

/// Sends the summary of a start, once: a later stop of the same start has nothing to report.
void KVRecordingSession::reportSummaryEvent(std::int64_t endReason) {
    const auto agent = reportingAgent();
    if (!agent) return;
    agent->setRecordedFileSize(getRecordedFileSize());
    agent->setEndReason(endReason);
    agent->reportEventWithType(KVReportingAgent::kSummaryEvent, agent->collectSummaryEventMetrics());
    reportingAgent_.set(nullptr);
}

std::uint64_t KVRecordingSession::getRecordedFileSize() const {
    const auto agent = reportingAgent();
    const auto writer = movieWriter();
    const std::string name = agent ? agent->serviceName() : "";
    if (!writer || (name != "SystemRecording" && name != "InAppRecording")) return 0;
    const auto attributes = services_.platform.fileSystem->attributesOfItem(writer->outputURL().path());
    if (!attributes) {
        KVLog("error getting recordedFileSize :%ld", static_cast<long>(attributes.error().code()));
        return 0;
    }
    KVLog("recordedFileSize for URL %lu bytes", static_cast<unsigned long>(attributes->size));
    return attributes->size;
}

/// Either camera counts as the front one: reports have always been so, and stay comparable.
void KVRecordingSession::sessionReportCameraUsage(std::uint32_t cameraPosition) {
    const auto agent = reportingAgent();
    if (!agent) return;
    if (cameraPosition == kBackCamera && !agent->backCameraUsed()) agent->setFrontCameraUsed(true);
    if (cameraPosition == kFrontCamera && !agent->frontCameraUsed()) agent->setFrontCameraUsed(true);
}

}  // namespace kelvo
