#include "base/KVLog.h"
#include "session/KVRecordingSession.h"

#include <utility>

namespace kelvo {

CaptureManager::SampleHandler KVRecordingSession::microphoneOutput() {
    return [weak = weak_from_this()](const SampleBufferRef& sample) {
        if (const auto self = weak.lock()) self->processMicrophoneSample(sample);
    };
}

CaptureManager::SampleHandler KVRecordingSession::appAudioOutput() {
    return [weak = weak_from_this()](const SampleBufferRef& sample) {
        if (const auto self = weak.lock()) self->processAppAudioSample(sample);
    };
}

void KVRecordingSession::setMicrophoneEnabled(bool enabled) {
    microphoneEnabled_ = enabled;
    const bool isNewlyWanted = !haveMicTap_ && systemRecording_ && recording_ && enabled;
    if (isNewlyWanted && services_.captureManager->hasAudioCaptureDevice()) setupMicTap();
}

/// A broadcast of an application taps the microphone even when it is off, so that it can be switched on
/// later; what the tap yields until then is silence.
bool KVRecordingSession::wantsMicTap() const {
    if (!services_.captureManager->hasAudioCaptureDevice()) return false;
    if (systemRecording_) return microphoneEnabled_;
    return daemonUserConsentForMicrophone_ && (microphoneEnabled_ || broadcastExtension());
}

void KVRecordingSession::setupMicTap() {
    KVLog("starting mic capture");
    services_.captureManager->startMicrophoneCaptureWithOutput(microphoneOutput(), [weak = weak_from_this()] {
        if (const auto self = weak.lock()) self->haveMicTap_ = true;
    });
}

void KVRecordingSession::frontmostApplicationDidChange(std::int32_t processIdentifier) {
    if (processIdentifier != frontmostPIDForAudioTap_)
        updateProcessIDForAudioCaptureWithPID(processIdentifier);
}

void KVRecordingSession::frontmostApplicationWasTerminated(std::int32_t processIdentifier) {
    if (processIdentifier == frontmostPIDForAudioTap_) services_.captureManager->stopAppAudioCapture();
}

void KVRecordingSession::frontmostApplicationDidEnterBackground(std::int32_t processIdentifier) {
    if (processIdentifier == frontmostPIDForAudioTap_) updateProcessIDForAudioCaptureWithPID(-1);
}

void KVRecordingSession::updateProcessIDForAudioCaptureWithPID(std::int32_t processIdentifier) {
    KVLog("updateProcessIDForAudioCaptureWithPID: %i", processIdentifier);
    if (!recording_) return;
    frontmostPIDForAudioTap_ = processIdentifier;
    KVLog("stopping audio capture");
    if (processIdentifier < 1) {
        KVLog("invalid pid stopping audio capture");
        return;  // the running tap goes on: it is meant to
    }
    services_.captureManager->stopAppAudioCapture();
    KVLog("update foreground app bundleId");
    updateBundleIdForFirstForegroundApp();
    KVLog("resuming audio capture for pid: %i", processIdentifier);
    services_.captureManager->resumeAppAudioCaptureForProcessID(processIdentifier, appAudioOutput());
}

void KVRecordingSession::updateBundleIdForFirstForegroundApp() {
    if (!isBroadcasting_ || bundleIDOfFirstForegroundApp()) return;
    const BundleRef bundle = services_.localization->bundleWithPID(frontmostPIDForAudioTap_);
    if (!bundle) return;
    const std::string identifier = bundle->bundleIdentifier();
    bundleIDOfFirstForegroundApp_.set(identifier);
    if (const auto link = broadcastExtension()) link->notifyExtensionOfFrontmostProcessBundleID(identifier);
}

void KVRecordingSession::processMicrophoneSample(const SampleBufferRef& sample) {
    updateDuartionWithSample(*sample);
    if (paused_) return;
    // Silence instead of a gap keeps the track continuous.
    if (!microphoneEnabled_) sample->silence();
    if (broadcastProcessMode() == BroadcastProcessMode::sampleBuffers) {
        if (const auto link = broadcastExtension())
            link->notifyExtensionOfAudioSampleBuffer(sample, SampleBuffer::Type::microphone);
    } else if (!captureRecording_) {
        if (const auto writer = movieWriter()) writer->appendAudio2SampleBuffer(sample);
    } else {
        packageAudioSampleBufferForCapture(sample, SampleBuffer::Type::microphone);
    }
    if (const auto agent = reportingAgent()) agent->countMicFrame();
}

void KVRecordingSession::processAppAudioSample(const SampleBufferRef& sample) {
    updateDuartionWithSample(*sample);
    if (paused_) return;
    const auto link = broadcastExtension();
    if (broadcastProcessMode() == BroadcastProcessMode::sampleBuffers) {
        if (link) link->notifyExtensionOfAudioSampleBuffer(sample, SampleBuffer::Type::applicationAudio);
    } else if (link) {
        // This sound is the clock of the fragments.
        link->processAudioSampleBufferForMP4ClipHandler(sample);
    } else if (!captureRecording_) {
        if (const auto writer = movieWriter()) writer->appendAudio1SampleBuffer(sample);
    } else {
        packageAudioSampleBufferForCapture(sample, SampleBuffer::Type::applicationAudio);
    }
    if (const auto agent = reportingAgent()) agent->countAppAudioFrame();
}

}  // namespace kelvo
