#include "base/KVLog.h"
#include "daemon/KVRecordingManager.h"
#include "daemon/StartRequest.h"

#include <algorithm>
#include <utility>

namespace kelvo {
namespace {

constexpr std::string_view kBroadcastInfoExtensionKey = "KVBroadcastInfoExtensionKey";
constexpr std::string_view kBroadcastInfoExtensionProcessModeKey = "KVBroadcastInfoExtensionProcessModeKey";
constexpr std::string_view kBroadcastInfoExtensionUserInfoKey = "KVBroadcastInfoExtensionUserInfoKey";
constexpr std::string_view kBroadcastInfoExtensionConfigurationKey =
    "KVBroadcastInfoExtensionConfigurationKey";
constexpr int kMainDisplay = 0;
constexpr std::int64_t kSplitScreenCount = 2;

Value valueIn(const Dictionary& dictionary, std::string_view key) {
    const Value* value = dictionary.find(key);
    return value != nullptr ? *value : Value();
}

std::shared_ptr<const KVBroadcastConfiguration> configurationIn(const Dictionary& extensionInfo) {
    const Value value = valueIn(extensionInfo, kBroadcastInfoExtensionConfigurationKey);
    const auto* handle = value.as<std::shared_ptr<ObjectHandle>>();
    return handle != nullptr ? std::dynamic_pointer_cast<const KVBroadcastConfiguration>(*handle) : nullptr;
}

OptionalError enableBroadcast(const StartRequest& request, const Dictionary& extensionInfo) {
    const Value mode = valueIn(extensionInfo, kBroadcastInfoExtensionProcessModeKey);
    const Value userInfo = valueIn(extensionInfo, kBroadcastInfoExtensionUserInfoKey);
    const Dictionary* entries = userInfo.asDictionary();
    return request.session->enableBroadcastWithExtension(
        valueIn(extensionInfo, kBroadcastInfoExtensionKey),
        static_cast<BroadcastProcessMode>(mode.asInteger().value_or(0)),
        entries != nullptr ? *entries : Dictionary(), request.listenerEndpoint);
}

}  // namespace

void KVRecordingManager::startRecordingWindowLayerContextIDs(
    const std::vector<std::uint32_t>& windowLayerContextIDs, const Size& windowSize, bool microphoneEnabled,
    bool cameraEnabled, bool broadcast, bool systemRecording, bool captureEnabled,
    const std::shared_ptr<IPCEndpoint>& listenerEndpoint, StartHandler handler) {
    const auto request = std::make_shared<const StartRequest>(StartRequest{
        getCallingConnectionRecordingSession(), windowLayerContextIDs, windowSize, microphoneEnabled,
        cameraEnabled, broadcast, systemRecording, captureEnabled, listenerEndpoint, std::move(handler)});
    if (!isClientAllowedToStart(*request)) return;
    // The text names an older form of the request; readers of logs know it so.
    KVLog(
        "KVRecordingManager:startRecordingWindowLayerContextID:windowSize:microphoneEnabled:streaming:"
        "withHandler:");
    stopCurrentRecordingSessionWithHandler([weakSelf = weak_from_this(), request](const OptionalError&) {
        if (const auto self = weakSelf.lock()) self->continueStart(request);
    });
}

/// What is checked before anything else is touched.
bool KVRecordingManager::isClientAllowedToStart(const StartRequest& request) {
    if (isTerminating()) {
        request.refuse(errors_->kvUserErrorForCode(kRecordingErrorInterrupted));
        return false;
    }
    if (platform_.inCarDisplay->isActive().valueOr(false)) {
        request.refuseAndUpdate(errors_->kvUserErrorForCode(kRecordingErrorAutobay));
        return false;
    }
    if (request.systemRecording) {
        if (clientHasSystemEntitlements()) return true;
        request.refuseAndUpdate(errors_->kvUserErrorForCode(kRecordingErrorEntitlements));
        return false;
    }
    if (checkContextIDsMatch(request.contextIDs)) return true;
    request.refuse(errors_->kvUserErrorForCode(kRecordingErrorFailedToStart));
    return false;
}

bool KVRecordingManager::checkContextIDsMatch(const std::vector<std::uint32_t>& contextIDs) const {
    const auto caller = getCallingConnectionBundleID();
    return std::ranges::all_of(contextIDs, [&](std::uint32_t contextID) {
        const auto process = platform_.renderServer->processIdentifierOfContext(contextID);
        if (!process || !caller) return false;
        const BundleRef bundle = localization_->bundleWithPID(*process);
        return bundle && bundle->bundleIdentifier() == *caller;
    });
}

/// Whatever was recorded has been stopped.
void KVRecordingManager::continueStart(const StartRequestRef& request) {
    if (request->session && request->session->isRecording()) {
        // A repeated start is no error.
        if (request->handler) request->handler(std::nullopt, isMicrophoneRecording(), isCameraRecording());
        request->updateClient();
        return;
    }
    if (!isDeviceReadyFor(*request)) return;
    microphoneRecording_ = request->microphoneEnabled;
    cameraRecording_ = request->cameraEnabled;
    if (!request->systemRecording && !doesUserConsent(*request)) return;
    KVLog("starting...");
    if (!isScreenFreeFor(*request)) return;
    // The process may have been told to end while the user was asked.
    if (isTerminating()) return request->refuse(errors_->kvUserErrorForCode(kRecordingErrorInterrupted));
    beginTransaction();
    if (!prepareBroadcast(*request)) return;
    configureSession(*request);
    frontmostSession(request->session, [weakSelf = weak_from_this(), request](std::int32_t process) {
        request->session->setFrontmostPIDForAudioTap(process);
        request->session->startSessionWithHandler([weakSelf, request] {
            if (const auto self = weakSelf.lock()) self->recordingStarted(*request);
        });
    });
    // The preference is looked at, and logged, for every recording; only that of the whole screen shows
    // itself.
    if (!isStatusBarHidden() && request->systemRecording) showStatusBar(*request);
}

bool KVRecordingManager::isDeviceReadyFor(const StartRequest& request) {
    if (!fileStore_->_srDeviceHasSufficientFreeSpaceForRecording()) {
        KVLog("insufficient disk space for recording, calling handler with error");
        request.refuseAndUpdate(errors_->kvUserErrorForCode(kRecordingErrorInsufficientStorage));
        return false;
    }
    if (!request.session) {
        request.refuse(errors_->kvUserErrorForCode(kRecordingErrorFailedToStart));
        return false;
    }
    if (!request.systemRecording) {
        if (applicationStateMonitor_->isApplicationInForegroundWithBundleIdentifier(
                request.session->bundleID())) {
            return true;
        }
        KVLog("app is not in the foreground, calling handler with error");
        request.refuse(errors_->kvUserErrorForCode(kRecordingErrorFailedToStart));
        return false;
    }
    // Whoever does not want to hear of a refusal is not refused.
    if (!deviceLocked_ || !request.handler) return true;
    KVLog("failed to start system recording because device was in locked state");
    request.refuseAndUpdate(errors_->kvUserErrorForCode(kRecordingErrorSystemDormancy));
    return false;
}

bool KVRecordingManager::doesUserConsent(const StartRequest& request) {
    if (isEngineersPreferencePresent("KVSuppressAlert", "suppressAlert")) return true;
    if (showAcknowledgementAlertForSession(request.session, request.broadcast)) return true;
    KVLog("user declined");
    request.refuse(errors_->kvUserErrorForCode(kRecordingErrorUserDeclined));
    return false;
}

bool KVRecordingManager::isEngineersPreferencePresent(const char* key, const char* name) const {
    if (!platform_.device->isInternalBuild()) return false;
    const bool isPresent = !platform_.preferences->value(key, kPreferencesDomain).isNothing();
    KVLog("KVRecordingManager: %s=%d", name, isPresent ? 1 : 0);
    return isPresent;
}

bool KVRecordingManager::isStatusBarHidden() const {
    return isEngineersPreferencePresent("KVHideStatusBar", "hideStatusBar");
}

/// An application may record itself only while it has the screen to itself.
bool KVRecordingManager::isScreenFreeFor(const StartRequest& request) {
    std::call_once(layoutMonitorCreated_, [this] {
        const auto monitor = platform_.displayLayout->createMonitor(kMainDisplay);
        setLayoutMonitor(monitor);
        monitor->addObserver(weak_from_this());
    });
    levelOneElementCount_ = countLevelOneElementsWithLayout(layoutMonitor()->currentLayout());
    if (request.systemRecording || levelOneElementCount_ < kSplitScreenCount) return true;
    KVLog("attempted to start recording in split mode, bailing out");
    request.refuse(errors_->kvUserErrorForCode(kRecordingErrorContentResize));
    return false;
}

bool KVRecordingManager::prepareBroadcast(const StartRequest& request) {
    if (!request.broadcast) {
        KVLog("broadcast disabled");
        request.session->disableBroadcast();
        return true;
    }
    KVLog("broadcast requested");
    const auto extensionInfo = request.session->extensionInfo();
    if (!extensionInfo) {
        KVLog("attempted to start broadcast without a session, bailing out");
        // Without a text for the user: it is the client that made a mistake.
        request.refuseAndUpdate(
            KVError(std::string(KVRecordingErrorDomain), kRecordingErrorInvalidBroadcastSession));
        return false;
    }
    KVLog("found broadcast info, enabling for session");
    request.session->setBroadcastConfiguration(configurationIn(*extensionInfo));
    const OptionalError error = enableBroadcast(request, *extensionInfo);
    if (!error || !request.handler) return true;
    request.refuseAndUpdate(*error);
    return false;
}

void KVRecordingManager::configureSession(const StartRequest& request) {
    RecordingSession& session = *request.session;
    session.setRecording(true);
    session.setBroadcasting(request.broadcast);
    sessionManager_->interruptOtherRecordingSessionAgainstSession(request.session);
    session.setSystemRecording(request.systemRecording);
    session.setContextIDs(request.contextIDs);
    session.setWindowSize(request.windowSize);
    session.setMicrophoneEnabled(request.systemRecording ? request.microphoneEnabled
                                                         : isMicrophoneRecording());
    session.setDelegate(weak_from_this());
    session.setCaptureRecording(request.captureEnabled);
}

void KVRecordingManager::frontmostSession(const SessionRef& session,
                                          std::function<void(std::int32_t)> applicationPID) {
    if (session->isSystemRecording()) {
        applicationStateMonitor_->frontmostApplicationProcessIdentifier(std::move(applicationPID));
        return;
    }
    const ClientProxyRef client = session->clientProxy();
    applicationPID(client ? client->processIdentifier() : 0);
}

void KVRecordingManager::recordingStarted(const StartRequest& request) {
    checkAndPlaySystemRecordSound(request.session, true);
    KVLog("recording session started");
    if (request.handler) request.handler(std::nullopt, isMicrophoneRecording(), isCameraRecording());
    if (request.systemRecording) {
        request.updateClient();
        applicationStateMonitor_->addSystemObserver(request.session);
    } else {
        applicationStateMonitor_->addObserver(request.session, request.clientProcess());
    }
}

void KVRecordingManager::showStatusBar(const StartRequest& request) {
    statusBarAssertion_->setDelegate(weak_from_this());
    statusBarAssertion_->setAssertionDelegate(weak_from_this());
    statusBarAssertion_->setBroadcasting(request.broadcast);
    statusBarAssertion_->setBroadcastServiceName(currentExtensionDisplayName_.copy().value_or(""));
    const auto show = [this] {
        statusBarAssertion_->showDoubleHeightStatusBarWithPid(platform_.processIdentifier);
        statusBarAssertion_->updateDoubleHeightStatusBarWithDuration(0, false);
    };
    // The stop that came before may have ended on the main queue itself.
    if (platform_.mainQueue->isCurrent()) {
        show();
    } else {
        platform_.mainQueue->sync(show);
    }
}

void KVRecordingManager::checkAndPlaySystemRecordSound(const SessionRef& session, bool isRecordingOn) {
    const bool isSoundWanted = platform_.device->regionalBehaviorShutterClick().value_or(false) ||
                               platform_.accessibility->isScreenReaderRunning();
    if (!isSoundWanted || !session || !session->isSystemRecording()) return;
    platform_.sounds->playSystemSound(isRecordingOn ? kSystemSoundBeginRecording : kSystemSoundEndRecording);
}

}  // namespace kelvo
