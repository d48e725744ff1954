#include "base/KVLog.h"
#include "daemon/KVRecordingManager.h"

#include <algorithm>

namespace kelvo {

void KVRecordingManager::setUpDeviceLockNotifications() {
    lockToResetToken_ = platform_.notifications->registerForNotification(
        kBlankedScreenNotification, QueuePriority::normal,
        [weakSelf = weak_from_this()](NotificationToken token) {
            if (const auto self = weakSelf.lock()) self->blankedScreenChanged(token);
        });
}

/// Only the recording of the whole screen stops with it; what applications record of themselves goes on.
void KVRecordingManager::blankedScreenChanged(NotificationToken token) {
    deviceLocked_ = platform_.notifications->state(token) != 0;
    if (!deviceLocked_) return;
    sessionManager_->stopSystemRecordingWithError(
        errors_->kvUserErrorForCode(kRecordingErrorInterrupted, Dictionary()));
}

void KVRecordingManager::callObserverCallChanged(CallObserver&, const Call& call) {
    if (call.isOutgoing || call.hasEnded) return;
    sessionManager_->stopSystemRecordingWithError(
        errors_->kvUserErrorForCode(kRecordingErrorInterrupted, Dictionary()));
}

void KVRecordingManager::profileConnectionDidReceiveEffectiveSettingsChangedNotification(
    RestrictionsProfile& profile) {
    if (profile.effectiveSetting(kScreenRecordingAllowedRestriction) != RestrictionSetting::no) return;
    sessionManager_->profileConnectionDidReceiveEffectiveSettingsChangedNotification();
}

std::int64_t KVRecordingManager::countLevelOneElementsWithLayout(const DisplayLayout& layout) {
    return std::ranges::count_if(layout.elements, [](const auto& element) { return element.level < 2; });
}

void KVRecordingManager::layoutMonitorDidUpdateDisplayLayout(DisplayLayoutMonitor&,
                                                             const DisplayLayout& layout) {
    const std::int64_t count = countLevelOneElementsWithLayout(layout);
    const auto elementCount = static_cast<std::int64_t>(layout.elements.size());
    levelOneElementCount_ = count;
    // One element alone fills the screen; an element above level 1 means that somebody still has it to
    // himself.
    if (elementCount != 1 && elementCount <= count) {
        sessionManager_->stopInAppRecordingSessionsBecauseOfMultitasking();
    }
}

void KVRecordingManager::broadcastSessionDidUpdateServiceInfo(const SessionRef& session,
                                                              const Dictionary& serviceInfo) {
    KVLog("KVRecordingManager:broadcastSessionDidUpdateServiceInfo:");
    if (const ClientProxyRef client = session->clientProxy()) client->updateBroadcastServiceInfo(serviceInfo);
}

void KVRecordingManager::broadcastSessionDidUpdateDuration(const SessionRef& session, double seconds) {
    KVLogSample("KVRecordingManager:broadcastSessionDidUpdateDuration:");
    statusBarAssertion_->setMicrophoneEnabled(session->microphoneEnabled());
    statusBarAssertion_->updateDoubleHeightStatusBarWithDuration(seconds, session->isPaused());
}

void KVRecordingManager::timerDidUpdate(const std::string& elapsedTime) {
    const SessionRef system = sessionManager_->getSystemRecordingSession();
    const ClientProxyRef client = system ? system->clientProxy() : nullptr;
    if (client) client->recordingTimerDidUpdate(elapsedTime);
}

void KVRecordingManager::statusBarCoordinatorInvalidatedRegistrationWithError(const OptionalError&) {
    KVLog("statusBarCoordinatior:invalidatedRegistration");
    sessionManager_->stopSystemRecordingWithError(
        errors_->kvUserErrorForCode(kRecordingErrorSystemDormancy, Dictionary()));
}

}  // namespace kelvo
