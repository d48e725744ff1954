#include "base/KVLog.h"
#include "media/KVCaptureManager.h"

#include <utility>

namespace kelvo {

void KVCaptureManager::startCaptureSession() {
    KVLog("KVCaptureManager: startCaptureSession");
    if (sessionInProgress_.exchange(true)) return;
    setCaptureSession(audio_->createCaptureSession());
}

void KVCaptureManager::setCaptureSession(CaptureSessionRef session) {
    const CaptureSessionRef current = captureSession_.copy();
    if (current == session) return;
    removeRunningObservation(current);
    captureSession_.set(std::move(session));
}

void KVCaptureManager::stopCaptureSession() {
    KVLog("KVCaptureManager: stopDeviceCaptureSessionWithFinishHandler");
    if (!sessionInProgress_.exchange(false)) return;
    const CaptureSessionRef session = captureSession_.copy();
    removeRunningObservation(session);
    session->stopRunning();
}

void KVCaptureManager::runSession(const CaptureSessionRef& session) {
    if (session->isRunning()) {
        callMicDidStartHandler();
        return;
    }
    session->addObserver(weak_from_this(), kRunningKeyPath);
    session->startRunning();
}

void KVCaptureManager::observeValueForKeyPath(std::string_view keyPath, CaptureSession& session) {
    if (keyPath != kRunningKeyPath) return;
    callMicDidStartHandler();
    static_cast<void>(session.removeObserver(this, kRunningKeyPath));
}

/// Whoever stops what never ran has nothing to take away, which is no failure.
void KVCaptureManager::removeRunningObservation(const CaptureSessionRef& session) const {
    if (session) static_cast<void>(session->removeObserver(this, kRunningKeyPath));
}

void KVCaptureManager::callMicDidStartHandler() {
    if (const DidStartHandler didStart = micDidStartHandler_.exchange(nullptr)) didStart();
}

}  // namespace kelvo
