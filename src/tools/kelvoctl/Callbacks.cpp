#include "tools/kelvoctl/Callbacks.h"

namespace kelvo::ctl {
namespace {

double presentationSeconds(const RecordBytes<TimingRecord>& timingData) {
    return recordFromBytes<TimingRecord>(timingData).presentationTime.seconds();
}

}  // namespace

void Callbacks::updateScreenRecordingState() {
    handler_("updateScreenRecordingState", {});
}

void Callbacks::updateBroadcastServiceInfo(const Dictionary& serviceInfo) {
    handler_("updateBroadcastServiceInfo", {{"serviceInfo", serviceInfo}});
}

void Callbacks::updateBroadcastURL(const URL& broadcastURL) {
    handler_("updateBroadcastURL", {{"broadcastURL", broadcastURL}});
}

void Callbacks::recordingDidStopWithError(const OptionalError& error, const std::optional<URL>& movieURL) {
    handler_("recordingDidStopWithError", {{"error", error ? Value(*error) : Value()},
                                           {"movieURL", movieURL ? Value(*movieURL) : Value()}});
}

void Callbacks::recordingLockInterrupted(const KVError& error) {
    handler_("recordingLockInterrupted", {{"error", error}});
}

void Callbacks::recordingShouldResume() {
    handler_("recordingShouldResume", {});
}

void Callbacks::recordingDidPause() {
    handler_("recordingDidPause", {});
}

void Callbacks::recordingTimerDidUpdate(const std::string& timerText) {
    handler_("recordingTimerDidUpdate", {{"timerText", timerText}});
}

void Callbacks::captureHandlerWithSample(const std::shared_ptr<KVIOSurfaceObject>&,
                                         const RecordBytes<TimingRecord>& timingData) {
    handler_("captureHandlerWithSample", {{"presentationTime", presentationSeconds(timingData)}});
}

void Callbacks::captureHandlerWithAudioSample(std::span<const std::byte> audioData,
                                              const RecordBytes<AudioFormatRecord>&, std::int64_t itemCount,
                                              SampleBuffer::Type bufferType,
                                              const RecordBytes<TimingRecord>& timingData) {
    handler_("captureHandlerWithAudioSample", {{"bytes", std::uint64_t{audioData.size()}},
                                               {"itemCount", itemCount},
                                               {"bufferType", static_cast<int>(bufferType)},
                                               {"presentationTime", presentationSeconds(timingData)}});
}

}  // namespace kelvo::ctl
