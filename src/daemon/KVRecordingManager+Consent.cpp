#include "base/KVLog.h"
#include "base/LocalizedFormat.h"
#include "daemon/KVRecordingManager.h"

#include <chrono>
#include <string>

namespace kelvo {
namespace {

/// How long an application may be in the background before its user is asked again.
constexpr std::chrono::seconds kExemptionThreshold{480};

/// "ACKNOWLEDGEMENT_" and "BROADCAST_" for broadcasts, with `rest`.
std::string acknowledgementKey(bool isBroadcast, const char* rest) {
    return std::string(isBroadcast ? "ACKNOWLEDGEMENT_BROADCAST_" : "ACKNOWLEDGEMENT_") + rest;
}

}  // namespace

std::string KVRecordingManager::localized(std::string_view key) const {
    return localization_->kvLocalizedStringFromFrameworkBundleWithKey(key).value_or("");
}

bool KVRecordingManager::showAcknowledgementAlertForSession(const SessionRef& session, bool isBroadcast) {
    KVLog("KVRecordingManager:showAcknowledgementAlert");
    if (isExemptFromAcknowledgementAlertSession(session)) return true;
    const auto alert = platform_.alerts->createAlert(acknowledgementAlert(*session, isBroadcast));
    if (!alert) {
        KVLogError("error showing acknowledgement alert");
        return false;
    }
    switch ((*alert)->waitForResponse()) {
        case SystemAlertResponse::alternateButton:
            userConsented(session);
            return true;
        case SystemAlertResponse::otherButton:
            userConsentedToLess(session);
            return true;
        default:
            KVLog("user refused recording");
            return false;
    }
}

SystemAlertContent KVRecordingManager::acknowledgementAlert(const RecordingSession& session,
                                                            bool isBroadcast) const {
    SystemAlertContent content = acknowledgementButtons(isBroadcast);
    const std::string name =
        localization_->kvLocalizedAppNameFromBundleID(session.bundleID()).value_or(std::string());
    if (session.isCapturing()) {
        content.header = formatLocalized(localized("ACKNOWLEDGEMENT_CAPTURE_ALERT_TITLE"), name);
        content.message = localized("ACKNOWLEDGEMENT_CAPTURE_ALERT_BODY");
    } else {
        content.header = formatLocalized(localized(acknowledgementKey(isBroadcast, "ALERT_TITLE")), name);
        content.message = localized(acknowledgementKey(isBroadcast, "ALERT_BODY"));
    }
    if (cameraRecording_ || microphoneRecording_) {
        // Plain recordings have no sentence for the microphone alone: the one about the camera serves.
        const bool isAboutMicrophone = isBroadcast && !cameraRecording_;
        content.message +=
            " " + localized(acknowledgementKey(isBroadcast,
                                               isAboutMicrophone ? "ALERT_BODY_MIC" : "ALERT_BODY_CAMERA"));
    }
    if (const BundleRef framework = localization_->kvFrameworkBundle())
        content.localizationPath = framework->path();
    return content;
}

SystemAlertContent KVRecordingManager::acknowledgementButtons(bool isBroadcast) const {
    const auto button = [&](const char* rest) { return localized(acknowledgementKey(isBroadcast, rest)); };
    SystemAlertContent content;
    content.defaultButton = localized("ACKNOWLEDGEMENT_ALERT_DECLINE_BUTTON");
    if (!cameraRecording_ && !microphoneRecording_) {
        content.otherButton = button("ALERT_ACCEPT_BUTTON_1_MICROPHONE_DISABLED");
        return content;
    }
    content.alternateButton =
        button(cameraRecording_ ? "ALERT_ACCEPT_BUTTON_1_CAMERA" : "ALERT_ACCEPT_BUTTON_1");
    content.otherButton = button("ALERT_ACCEPT_BUTTON_2");
    return content;
}

void KVRecordingManager::userConsented(const SessionRef& session) {
    KVLog("user acknowledged recording");
    updateExemptionListWithSession(session);
    session->setDaemonUserConsentForMicrophone(isMicrophoneRecording());
}

/// The second button takes away the camera and the microphone alike.
void KVRecordingManager::userConsentedToLess(const SessionRef& session) {
    if (cameraRecording_.exchange(false)) {
        KVLog("user acknowledged recording, but camera recording is disabled");
    } else {
        KVLog("user acknowledged recording, but microphone recording is disabled");
    }
    microphoneRecording_ = false;
    session->setDaemonUserConsentForMicrophone(false);
    updateExemptionListWithSession(session);
}

bool KVRecordingManager::isExemptFromAcknowledgementAlertSession(const SessionRef& session) const {
    return exemptBundleIdentifiers_.with(
        [&](const auto& exempt) { return exempt.contains(session->bundleID()); });
}

void KVRecordingManager::updateExemptionListWithSession(const SessionRef& session) {
    const auto add = [&](auto& exempt) { exempt.insert(session->bundleID()); };
    exemptBundleIdentifiers_.with(add);
    if (microphoneRecording_) exemptWithMicRecordingEnabledBundleIdentifiers_.with(add);
}

void KVRecordingManager::expireAcknowledgementExemptionsForBundleID(
    const std::optional<std::string>& bundleIdentifier) {
    if (!bundleIdentifier) return;
    KVLog("KVRecordingManager:removeAcknowledgementExemptionIfOverThreshholdForBundleID:");
    const Date now = platform_.clock->now();
    const bool isOver = lastBackgroundDateByBundleIdentifier_.with([&](Dictionary& dates) {
        const Value* entry = dates.find(*bundleIdentifier);
        const Date* since = entry != nullptr ? entry->as<Date>() : nullptr;
        if (since == nullptr || now - *since <= kExemptionThreshold) return false;
        return dates.remove(*bundleIdentifier);
    });
    if (!isOver) return;
    const auto remove = [&](auto& exempt) { exempt.erase(*bundleIdentifier); };
    exemptBundleIdentifiers_.with(remove);
    exemptWithMicRecordingEnabledBundleIdentifiers_.with(remove);
    KVLog("removedExemption");
}

/// The clock runs from the first time: later ones do not move the date.
void KVRecordingManager::recordingSessionClientDidEnterBackground(const SessionRef& session) {
    KVLog("KVRecordingManager:recordingSessionClientDidEnterBackground:");
    const Date now = platform_.clock->now();
    lastBackgroundDateByBundleIdentifier_.with([&](Dictionary& dates) {
        if (!dates.contains(session->bundleID())) dates.set(session->bundleID(), now);
    });
}

void KVRecordingManager::recordingSessionClientDidEnterForeground(const SessionRef& session) {
    KVLog("KVRecordingManager:recordingSessionClientDidEnterForeground:");
    expireAcknowledgementExemptionsForBundleID(session->bundleID());
    const auto interruptedMovie = session->interruptedMovieURL();
    if (!session->isRecording() || !interruptedMovie) return;
    KVLog("current session was interrupted - notify client app of error");
    recordingSessionStoppedWithError(session, errors_->kvUserErrorForCode(kRecordingErrorInterrupted),
                                     interruptedMovie);
    session->setInterruptedMovieURL(std::nullopt);
}

}  // namespace kelvo
