#include "base/KVLog.h"
#include "media/GapSample.h"
#include "media/KVCaptureManager.h"

#include <utility>

namespace kelvo {

void KVCaptureManager::startMicrophoneCaptureWithOutput(SampleHandler output, DidStartHandler didStart) {
    audioDispatchQueue().async(
        [self = shared_from_this(), output = std::move(output), didStart = std::move(didStart)]() mutable {
            self->startMicrophone(std::move(output), std::move(didStart));
        });
}

void KVCaptureManager::startMicrophone(SampleHandler output, DidStartHandler didStart) {
    if (recordingMicrophone_) return;
    KVLog("KVCaptureManager: setAudioCaptureEnabled: YES");
    startCaptureSession();
    const CaptureSessionRef session = captureSession_.copy();
    session->setUsesApplicationAudioSession(true);
    session->setAutomaticallyConfiguresApplicationAudioSession(false);
    if (output) microphoneOutputHandler_.set(std::move(output));
    recordingMicrophone_ = true;
    addMicrophoneToSession(*session);
    micDidStartHandler_.set(std::move(didStart));
    runSession(session);
}

void KVCaptureManager::addMicrophoneToSession(CaptureSession& session) {
    const CaptureInputRef input = audio_->createInput(audio_->defaultAudioDevice()).valueOr(nullptr);
    captureDeviceAudioInput_.set(input);
    if (session.canAddInput(input)) session.addInput(input);
    const std::shared_ptr<AudioDataOutput> output = audio_->createAudioDataOutput();
    captureSessionAudioDataOutput_.set(output);
    output->setSampleBufferDelegate(weak_from_this(), sampleQueue_);
    if (session.canAddOutput(output)) session.addOutput(output);
}

void KVCaptureManager::stopMicrophoneCapture() {
    onDispatchQueue([this] { removeMicrophone(); });
    waitForRunningMicrophoneHandler();
}

void KVCaptureManager::removeMicrophone() {
    if (!recordingMicrophone_) return;
    KVLog("KVCaptureManager: setAudioCaptureEnabled: NO");
    recordingMicrophone_ = false;
    const CaptureSessionRef session = captureSession_.copy();
    session->removeInput(captureDeviceAudioInput_.copy());
    session->removeOutput(captureSessionAudioDataOutput_.copy());
}

/// Not on the dispatch queue: a microphone handler that stops capture needs that queue to get anywhere.
void KVCaptureManager::waitForRunningMicrophoneHandler() const {
    if (sampleQueue_->isCurrent() || audioDispatchQueue().isCurrent()) return;
    sampleQueue_->sync([] {});
}

void KVCaptureManager::captureOutputDidOutputSampleBuffer(const CaptureOutputRef& output,
                                                          const SampleBufferRef& sample,
                                                          const CaptureConnection&) {
    if (output == captureSessionAudioDataOutput_.copy()) {
        deliverMicrophoneSample(sample);
    } else if (output == captureSessionVideoDataOutput_.copy()) {
        if (const SampleHandler camera = cameraOutputHandler_.copy()) camera(sample);
    }
}

void KVCaptureManager::deliverMicrophoneSample(const SampleBufferRef& sample) {
    const SampleHandler output = microphoneOutputHandler_.copy();
    if (!output) return;
    checkAndHandleMicInterruption(output);
    const auto duration = std::chrono::duration<double>(sample->duration().seconds());
    lastMicAudioDate_.set(clock_->now() + std::chrono::round<std::chrono::nanoseconds>(duration));
    micInterruptionPresentationTimeStamp_.set(sample->presentationTime() + sample->duration());
    output(sample);
}

void KVCaptureManager::checkAndHandleMicInterruption(const SampleHandler& output) {
    if (!micInterrupted_.exchange(false)) return;
    const std::optional<Date> lastEnd = lastMicAudioDate_.copy();
    if (!lastEnd) return;
    const double gap = inSeconds(clock_->now() - *lastEnd);
    if (!(gap > 0)) return;
    KVLog("gap since last mic tap, filling with empty sample buffer");
    const SampleBufferRef silence =
        makeGapSample(audioBasicDescription_, gap, micInterruptionPresentationTimeStamp_.copy());
    if (silence) output(silence);
}

void KVCaptureManager::handleAudioSessionInterruption(std::uint64_t type) {
    if (type == kAudioInterruptionEnded) {
        KVLog("KVCaptureManager: MXAudioSessionInterruptionTypeEnded");
    } else if (type == kAudioInterruptionBegan) {
        KVLog("KVCaptureManager: MXAudioSessionInterruptionTypeBegan");
        micInterrupted_ = true;
    }
}

}  // namespace kelvo
