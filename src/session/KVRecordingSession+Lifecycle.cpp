#include "base/KVLog.h"
#include "session/KVRecordingSession.h"

#include <ratio>
#include <set>
#include <utility>

namespace kelvo {
namespace {

constexpr int kBroadcastFrameRate = 30;
constexpr int kFrameRate = 60;

}  // namespace

void KVRecordingSession::startSessionWithHandler(CompletionHandler completion) {
    KVLog("KVRecordingSession: startSession");
    resetForStart();
    const auto begin = [weak = weak_from_this(), run = currentRun(), completion = std::move(completion)] {
        if (const auto self = weak.lock()) self->_resumeOrStartSession(run);
        if (completion) completion();
    };
    if (broadcastProcessMode() == BroadcastProcessMode::movieClips) {
        services_.cleanUps->afterwards(
            [writer = makeMovieWriter(), begin] { writer->startWritingHandler(begin); });
    } else {
        notifyExtensionOfAction(ExtensionAction::start, begin);
    }
}

void KVRecordingSession::resetForStart() {
    bundleIDOfFirstForegroundApp_.set(std::nullopt);
    captureStartTime_.set(std::nullopt);
    paused_ = false;
    timeline_.with([](Timeline& timeline) { timeline.hasBegun = false; });
    shouldStopLock_.lock();
    shouldStop_ = false;
    shouldStopLock_.unlock();
    reportingAgent_.set(
        std::make_shared<KVReportingAgent>(_serviceNameForReporting(), services_.platform.analytics));
}

std::shared_ptr<MovieWriter> KVRecordingSession::makeMovieWriter() {
    auto writer = services_.createMovieWriter(sizeForScreen(), outputPath());
    movieWriter_.set(writer);
    writer->setBroadcastConfig(broadcastConfiguration());
    writer->setSystemRecording(systemRecording_);
    return writer;
}

/// The capture size; of a whole screen, lying or standing as the screen was built.
Size KVRecordingSession::sizeForScreen() const {
    Size size = windowSize();
    if (!systemRecording_) return size;
    KVLog("Before windowSize w:%f h:%f", size.width, size.height);
    const bool isPortrait = isNativeScreenOrientationPortrait();
    if (isPortrait ? size.width > size.height : size.width < size.height) std::swap(size.width, size.height);
    KVLog("After windowSize w:%f h:%f", size.width, size.height);
    return size;
}

/// Begins to capture, unless `run` was stopped while the writer or the extension got ready.
void KVRecordingSession::_resumeOrStartSession(CaptureRun run) {
    if (run != currentRun()) return;
    setupMirroring();
    const int rate = frameRate();
    if (const auto agent = reportingAgent()) {
        agent->setVideoCaptureSize(windowSize());
        agent->setVideoCaptureRate(rate);
    }
    prepareScreenSource(rate);
    if (wantsMicTap()) setupMicTap();
    const std::int32_t tapped = frontmostPIDForAudioTap_;
    if (tapped < 1) {
        startScreenSource(run);
    } else {
        services_.captureManager->startAppAudioCaptureForProcessID(tapped, appAudioOutput(),
                                                                   [weak = weak_from_this(), run] {
                                                                       if (const auto self = weak.lock())
                                                                           self->startScreenSource(run);
                                                                   });
    }
    captureStartTime_.set(services_.platform.clock->now());
}

void KVRecordingSession::setupMirroring() {
    DisplayMirroring& mirroring = *services_.platform.displayMirroring;
    if (systemRecording_) {
        KVLog("mirror mode");
        mirroring.setMode(MirroringMode::wholeScreen);
        return;
    }
    KVLog("kelvo mode");
    const auto contexts = contextIDs();
    mirroring.setCloneContexts(std::set<std::uint32_t>(contexts.begin(), contexts.end()));
    mirroring.setMode(MirroringMode::cloneContexts);
}

int KVRecordingSession::frameRate() const {
    return broadcastExtension() ? kBroadcastFrameRate : kFrameRate;
}

/// The source is made once and keeps the size that the first recording had.
void KVRecordingSession::prepareScreenSource(int rate) {
    std::lock_guard lock(screenMutex_);
    if (!screenCaptureController_) {
        screenCaptureController_ =
            services_.platform.screenCapture->createSource(windowSize(), MediaTime::make(1, rate));
    }
    screenCaptureController_->setDelegate(weak_from_this());
}

void KVRecordingSession::startScreenSource(CaptureRun run) {
    std::lock_guard lock(screenMutex_);
    if (run != captureRun_ || !screenCaptureController_) return;
    KVLog("starting capture with VelaCaptureController");
    screenCaptureController_->startCapture();
}

KVRecordingSession::CaptureRun KVRecordingSession::currentRun() const {
    std::lock_guard lock(screenMutex_);
    return captureRun_;
}

void KVRecordingSession::pauseSession() {
    if (paused_.exchange(true)) return;
    KVLog("KVRecordingSession: pauseSession");
    stopAllCapture();
    if (broadcastExtension()) notifyExtensionOfAction(ExtensionAction::pause, nullptr);
}

void KVRecordingSession::resumeSessionWithContextID(std::uint32_t contextID) {
    if (!paused_) return;
    KVLog("KVRecordingSession: resumeSessionWithContextID:");
    contextIDs_.set({contextID});
    timeline_.with([](Timeline& timeline) { timeline.sessionWasResumed = true; });
    // A frame that came between the pause and the source's stop has left the lock taken. The source stands
    // still, so no frame holds it: the recording goes on with a free one.
    shouldStopLock_.lock();
    shouldStopLock_.unlock();
    paused_ = false;
    if (broadcastExtension()) notifyExtensionOfAction(ExtensionAction::resume, nullptr);
    _resumeOrStartSession(currentRun());
}

void KVRecordingSession::stopAllCapture() {
    KVLog("KVRecordingSession: stopAllCapture");
    const auto startTime = captureStartTime();
    if (const auto agent = reportingAgent(); agent && startTime) {
        const auto active = services_.platform.clock->now() - *startTime;
        agent->setActiveDuration(agent->activeDuration() + inSeconds(active));
    }
    std::shared_ptr<ScreenCaptureSource> source;
    {
        std::lock_guard lock(screenMutex_);
        ++captureRun_;
        source = screenCaptureController_;
    }
    if (source) {
        source->stopCapture();
        source->setDelegate({});
    }
    services_.captureManager->stopAllCapture();
    KVLog("Stop mirroring");
    services_.platform.displayMirroring->setMode(MirroringMode::off);
    haveMicTap_ = false;
}

/// A movie of a screen that stands still lasts until its end; that of a paused recording ended with the
/// pause.
void KVRecordingSession::noteCaptureEnd() {
    const auto writer = movieWriter();
    if (!writer || paused_) return;
    const auto now = services_.platform.clock->monotonicNow();
    writer->captureEnded(MediaTime::make(now.count(), std::nano::den));
}

void KVRecordingSession::stopRecordingWithNotification(bool notify, const OptionalError& error) {
    // A failing source and a finishing owner may come at once: the first of them stops the recording.
    if (!recording_.exchange(false)) return;
    KVLog("KVRecordingSession: stop");
    noteCaptureEnd();
    stopAllCapture();
    isBroadcasting_ = false;
    if (notify) {
        if (const auto delegate = delegate_.copy().lock())
            delegate->recordingSessionStoppedWithError(shared_from_this(), error);
    }
    reportSummaryEvent(error ? error->code() : 0);
}

void KVRecordingSession::notifyExtensionOfAction(ExtensionAction action, CompletionHandler completion) {
    if (!completion) completion = [] {};
    if (const auto link = broadcastExtension()) {
        link->notifyExtensionOfAction(action, std::move(completion));
    } else {
        completion();
    }
}

void KVRecordingSession::clientApplicationDidEnterBackground() {
    if (systemRecording_ || !recording_ || paused_) return;
    pauseSession();
    if (const auto client = clientProxy()) client->recordingDidPause();
    if (const auto delegate = delegate_.copy().lock())
        delegate->recordingSessionClientDidEnterBackground(shared_from_this());
}

void KVRecordingSession::clientApplicationDidEnterForeground() {
    if (const auto client = clientProxy()) client->recordingShouldResume();
    if (const auto delegate = delegate_.copy().lock())
        delegate->recordingSessionClientDidEnterForeground(shared_from_this());
}

}  // namespace kelvo
