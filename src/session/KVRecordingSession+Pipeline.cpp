#include "base/KVLog.h"
#include "ipc/KVIOSurfaceObject.h"
#include "session/KVRecordingSession.h"
#include "session/SampleRebase.h"

#include <utility>

namespace kelvo {

void KVRecordingSession::screenCaptureControllerDidReceiveSampleBuffer(ScreenCaptureSource&,
                                                                       const SampleBufferRef& sample,
                                                                       const ScreenTransform& flags) {
    if (!sample) return;
    const VideoSurface& surface = *sample->surface();
    KVLogSample("Screen sampled at w:%zu h:%zu", std::size_t{surface.width()}, std::size_t{surface.height()});
    beginTimeline(sample->presentationTime());
    updateDuartionWithSample(*sample);
    if (broadcastExtension()) {
        _processSampleBufferForStreaming(sample, flags);
    } else {
        _processSampleBuffer(sample, flags);
    }
}

/// The first frame of the session fixes the beginning for good; the first one of each recording lets
/// application audio in.
void KVRecordingSession::beginTimeline(const MediaTime& presentationTime) {
    const bool isFirst = timeline_.with([&](Timeline& timeline) {
        if (timeline.firstSampleTimestamp.isZero()) timeline.firstSampleTimestamp = presentationTime;
        return !std::exchange(timeline.hasBegun, true);
    });
    if (isFirst) services_.captureManager->setCaptureStartTime(presentationTime);
}

void KVRecordingSession::_processSampleBufferForStreaming(const SampleBufferRef& sample,
                                                          const ScreenTransform& flags) {
    _processSampleBuffer(sample, flags);
}

void KVRecordingSession::_processSampleBuffer(const SampleBufferRef& sample, const ScreenTransform& flags) {
    KVLogSample("KVRecordingSession:screenCaptureController:didReceiveSampleBuffer:transformFlags:");
    if (!shouldStopLock_.lockUnlessLeftTaken()) return;
    if (shouldStop_) {
        shouldStopLock_.unlock();
        return;
    }
    if (paused_) {
        KVLogSample("session is paused discard sample");
        shouldStopLock_.leaveTaken();
        return;
    }
    moveTimeline(sample->presentationTime());
    _updateSampleBufferWithOffset(sample,
                                  [&](const SampleBufferRef& rebased) { routeVideo(rebased, flags); });
    shouldStopLock_.unlock();
}

/// Notes the time of a frame; of the first one after a pause, how much time there is to cut out.
void KVRecordingSession::moveTimeline(const MediaTime& presentationTime) {
    timeline_.with([&](Timeline& timeline) {
        if (!timeline.sessionWasResumed) {
            timeline.lastSampleTimestamp = presentationTime;
            return;
        }
        timeline.sessionWasResumed = false;
        std::int64_t gap = presentationTime.value - timeline.lastSampleTimestamp.value;
        if (!timeline.sampleTimeOffset.isZero()) gap += timeline.sampleTimeOffset.value;
        timeline.sampleTimeOffset = MediaTime::make(gap, presentationTime.timescale);
    });
}

void KVRecordingSession::_updateSampleBufferWithOffset(const SampleBufferRef& sample,
                                                       const SampleHandler& handler) {
    const MediaTime offset = sampleTimeOffset();
    if (offset.isZero()) {
        handler(sample);
        return;
    }
    const MediaTime original = sample->presentationTime();
    const MediaTime rebased = MediaTime::make(original.value - offset.value, original.timescale);
    const SampleBufferRef copy = _copySampleBufferFromSourceBuffer(sample, rebased);
    if (copy) services_.captureManager->setCaptureStartTime(rebased);
    handler(copy ? copy : sample);
}

SampleBufferRef KVRecordingSession::_copySampleBufferFromSourceBuffer(
    const SampleBufferRef& source, const MediaTime& updatedTimeStamp) const {
    const auto timing = rebasedTiming(source->timing(), updatedTimeStamp);
    return timing ? source->copyWithTiming(*timing) : nullptr;
}

void KVRecordingSession::routeVideo(const SampleBufferRef& sample, const ScreenTransform& flags) {
    const VideoSurface& surface = *sample->surface();
    const Size size{static_cast<double>(surface.width()), static_cast<double>(surface.height())};
    const AffineTransform transform = systemRecording_ ? affineTransform(flags, size) : AffineTransform();
    if (broadcastProcessMode() == BroadcastProcessMode::sampleBuffers) {
        if (const auto link = broadcastExtension())
            link->notifyExtensionOfVideoSampleBuffer(sample, SampleBuffer::Type::video,
                                                     orientationFromVelaTransform(flags));
    } else if (!captureRecording_) {
        const auto writer = movieWriter();
        if (writer && !writer->appendVideoSampleBuffer(sample, transform))
            failWith(kRecordingErrorFailedToSave);
    } else {
        packageVideoSampleBufferForCapture(sample);
    }
    if (const auto agent = reportingAgent()) agent->countVideoFrame();
}

/// Tells how long the recording has been running, by the samples' own clock and with its pauses.
void KVRecordingSession::updateDuartionWithSample(const SampleBuffer& sample) {
    const MediaTime time = sample.presentationTime();
    const std::int64_t elapsed = time.value - firstSampleTimestamp().value;
    if (const auto delegate = delegate_.copy().lock()) {
        delegate->broadcastSessionDidUpdateDuration(shared_from_this(),
                                                    MediaTime::make(elapsed, time.timescale).seconds());
    }
}

void KVRecordingSession::packageVideoSampleBufferForCapture(const SampleBufferRef& sample) {
    const auto client = clientProxy();
    if (!client) return;
    const auto surface = std::make_shared<KVIOSurfaceObject>();
    surface->setIOSurface(sample->surface());
    client->captureHandlerWithSample(surface, bytesOfRecord(sample->timing().front()));
}

void KVRecordingSession::packageAudioSampleBufferForCapture(const SampleBufferRef& sample,
                                                            SampleBuffer::Type type) {
    const auto client = clientProxy();
    if (!client) return;
    client->captureHandlerWithAudioSample(sample->audioBytes(), bytesOfRecord(sample->audioFormat()),
                                          sample->sampleCount(), type,
                                          bytesOfRecord(sample->timing().front()));
}

void KVRecordingSession::screenCaptureControllerDidFailWithStatus(ScreenCaptureSource&, ScreenCaptureStatus) {
    KVLog("KVRecordingSession: screenCaptureController: didFailWithStatus:");
    failWith(kRecordingErrorMediaServicesFailed);
}

void KVRecordingSession::screenCaptureControllerWasPreempted(ScreenCaptureSource&) {
    KVLog("KVRecordingSession: screenCaptureControllerWasPreempted");
    failWith(kRecordingErrorInterrupted);
}

/// Under the lock from the flag to the stop, so that no frame is processed in between.
void KVRecordingSession::screenCaptureControllerMediaServicesWereReset(ScreenCaptureSource&) {
    shouldStopLock_.lock();
    shouldStop_ = true;
    KVLog("KVRecordingSession: screenCaptureControllerMediaServicesWereReset");
    failWith(kRecordingErrorMediaServicesFailed);
    shouldStopLock_.unlock();
}

void KVRecordingSession::failWith(KVRecordingErrorCode code) {
    stopRecordingWithNotification(true, services_.errors->kvUserErrorForCode(code));
}

}  // namespace kelvo
