#pragma once

#include "base/Guarded.h"
#include "base/SerialQueue.h"
#include "daemon/MoviesInUse.h"
#include "daemon/StartRequest.h"
#include "ipc/KVConnectionManager.h"
#include "ipc/KVUserErrors.h"
#include "media/KVAudioMixUtility.h"
#include "platform/PhotoAsset.h"
#include "platform/Platform.h"
#include "session/KVRecordingSessionDelegate.h"
#include "session/KVSessionManager.h"
#include "support/KVApplicationStateMonitor.h"
#include "support/KVLocalization.h"
#include "support/KVStatusBarAssertion.h"
#include "support/KVTemporaryFileStore.h"

#include <atomic>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <string>

namespace kelvo {

/// The daemon's one coordinator: owns every long-lived service, serves every client request and decides what
/// the user sees. Created once when the process starts and never replaced.
///
/// Requests run one at a time on the connection manager's queue. The blanked-screen handler runs on the
/// global queue of normal priority, calls on the main queue, restrictions, layouts and purges on their
/// services' threads, alerts on the alert queue; state that several of them touch is atomic or guarded.
class KVRecordingManager : public KVConnectionManagerDelegate,
                           public KVSessionManagerDelegate,
                           public KVRecordingSessionDelegate,
                           public KVStatusBarAssertionDelegate,
                           public StatusBarCoordinatorDelegate,
                           public CallObserverDelegate,
                           public RestrictionsObserver,
                           public DisplayLayoutObserver,
                           public BulletinDataProvider,
                           public std::enable_shared_from_this<KVRecordingManager> {
  public:
    /// Builds the manager and registers it with the platform's services. Never fails: each service is created
    /// unconditionally. Clients are not accepted before `finishStartup`.
    static std::shared_ptr<KVRecordingManager> create(const Platform& platform, SessionFactory createSession);
    ~KVRecordingManager() override;

    /// Accepts clients from now on. Once, right after `create`.
    void finishStartup();

    /// The process is about to end: finishes every recording and saves that of the whole screen, refuses new
    /// ones, and calls `done`, on whatever thread, when all that and every stop and save under way is over. A
    /// movie that is finished and not saved lies in the store then. Any thread; once.
    void finishForTermination(std::function<void()> done);

    /// The queue on which every blocking alert is shown; one for the process.
    static SerialQueue& kelvoAlertQueue();

    /// Called when a recording starts and when a session is reset. They do nothing, and keep the order
    /// visible.
    void beginTransaction() {}
    void endTransaction() {}

    /// Whether the client whose request is served holds "com.quillon.private.kelvo-kit".
    bool clientHasSystemEntitlements() const;
    /// The bundle identifier of that client; none when its program belongs to no bundle.
    std::optional<std::string> getCallingConnectionBundleID() const;
    /// That client's session, or none.
    SessionRef getCallingConnectionRecordingSession() const;

    // Session manager's delegate.
    void prepareForStoppingSession(const SessionRef& session) override;
    void resetStatesForSession(const SessionRef& session) override;
    void recordingSessionStoppedWithError(const SessionRef& session, const OptionalError& error,
                                          const std::optional<URL>& movieURL) override;
    void failedToSaveRecordingForRecordingSession(const SessionRef& session, const KVError& error) override;
    void saveVideoToCameraRoll(const std::optional<URL>& movieURL, ErrorHandler completion) override;

    /// Stops whatever records and saves the movie of a system recording; `handler` (may be none) never gets
    /// an error. Caller's thread, or where the stopped session finishes.
    void stopCurrentRecordingSessionWithHandler(ErrorHandler handler);

    /// Whether the store's movie of that name is recorded now, saved now, or in the hands of a client that
    /// has yet to say what becomes of it. Any thread.
    bool isMovieInUse(const std::string& name) const;

    // Recording sessions' delegate.
    void recordingSessionStoppedWithError(const SessionRef& session, const OptionalError& error) override;
    void broadcastSessionDidUpdateServiceInfo(const SessionRef& session,
                                              const Dictionary& serviceInfo) override;
    void broadcastSessionDidUpdateDuration(const SessionRef& session, double seconds) override;
    void recordingSessionClientDidEnterBackground(const SessionRef& session) override;
    void recordingSessionClientDidEnterForeground(const SessionRef& session) override;

    // The status bar's delegates.
    void timerDidUpdate(const std::string& elapsedTime) override;
    void statusBarCoordinatorInvalidatedRegistrationWithError(const OptionalError& error) override;

    // Consent, keyed by bundle identifier. An application that the user let record needs no alert until it
    // has been in the background for more than eight minutes.
    /// Asks the user, and blocks until there is an answer. True: go ahead, perhaps with the microphone and
    /// the camera switched off in the manager.
    bool showAcknowledgementAlertForSession(const SessionRef& session, bool isBroadcast);
    bool isExemptFromAcknowledgementAlertSession(const SessionRef& session) const;
    void updateExemptionListWithSession(const SessionRef& session);
    void expireAcknowledgementExemptionsForBundleID(const std::optional<std::string>& bundleIdentifier);

    /// Whether every context is drawn by a process of the caller's bundle; true for no contexts.
    bool checkContextIDsMatch(const std::vector<std::uint32_t>& contextIDs) const;

    // Alerts about system recordings, on the alert queue, which they block until they are answered.
    void showAlertForRecordingSession(const SessionRef& session, const OptionalError& error);
    void showAlertRecordingSessionFailedToSaveFile(const SessionRef& session, const OptionalError& error);
    /// Cannot lead the user to the extension's application yet, and so is only logged.
    void showAlertForBroadcastSession(const SessionRef& session, const OptionalError& error);
    /// Whether the user lets a paused broadcast go on: nobody can be asked yet, and it does. Caller's thread.
    bool showResumeBroadcastAlertWithSession(const SessionRef& session, std::uint32_t contextID);

    // The bulletin about a saved recording, on the bulletin service's queue but for its making.
    BulletinRequest createBulletinRequestWithAssetURL(const std::string& localIdentifier);
    void handleBulletinActionResponse(const std::string& actionIdentifier) override;
    BulletinSection bulletinSection() override;
    std::string sectionIdentifier() const;

    // Client requests, on the connection manager's queue. One that the daemon does not offer yet is answered
    // with an error of the domain; without a handler to tell it to, it is logged and does nothing.
    void startRecordingWindowLayerContextIDs(const std::vector<std::uint32_t>& windowLayerContextIDs,
                                             const Size& windowSize, bool microphoneEnabled,
                                             bool cameraEnabled, bool broadcast, bool systemRecording,
                                             bool captureEnabled,
                                             const std::shared_ptr<IPCEndpoint>& listenerEndpoint,
                                             StartHandler handler) override;
    void setupBroadcastWithHostBundleID(const std::string& hostBundleID,
                                        const std::string& broadcastExtensionBundleID,
                                        const Bytes& broadcastConfigurationData, const Dictionary& userInfo,
                                        ErrorHandler handler) override;
    void getCurrentBroadcastImages(ImagesHandler handler) override;
    void getSystemBroadcastExtensionInfo(ExtensionsHandler handler) override;
    void stopRecordingWithHandler(MovieHandler handler) override;
    void stopRecordingWithStartClipDuration(double startClipDuration, double endClipDuration,
                                            MovieHandler handler) override;
    void saveVideoToCameraRoll(const URL& movieURL, ErrorHandler handler) override;
    void pauseRecording() override;
    void resumeRecordingWithWindowLayerContextID(std::uint32_t windowLayerContextID) override;
    void setMicrophoneEnabled(bool enabled) override;
    void updateProcessIDForAudioCaptureWithPID(std::int32_t processIdentifier) override;
    void discardRecordingWithHandler(DoneHandler handler) override;
    void synchronousGetCurrentState(StateHandler handler) override;
    void synchronousIsBroadcastingWithPreferredExtension(const std::string& preferredExtension,
                                                         BooleanHandler handler) override;
    void setHasUserConsentForCamera(bool consent) override;
    void setHasUserConsentForMicrophone(bool consent) override;
    void setBroadcastURL(const URL& broadcastURL) override;
    void setMicrophoneEnabledPersistent(bool enabled) override;
    void reportCameraUsage(std::int32_t cameraUsage) override;

    // Clients that come and go, on a thread of the transport.
    /// Gives the bundle's session its client. A client without a bundle gets neither.
    void connectionManagerDidAcceptNewConnection(const IPCConnectionRef& connection,
                                                 const std::optional<std::string>& bundleIdentifier) override;
    void applicationDisconnectedWithBundleID(const std::optional<std::string>& bundleIdentifier,
                                             std::int32_t processIdentifier) override;

    // What the world around a recording does.
    void callObserverCallChanged(CallObserver& observer, const Call& call) override;
    void profileConnectionDidReceiveEffectiveSettingsChangedNotification(
        RestrictionsProfile& profile) override;
    void layoutMonitorDidUpdateDisplayLayout(DisplayLayoutMonitor& monitor,
                                             const DisplayLayout& layout) override;
    /// The number of elements that are applications: those of level 0 and 1.
    static std::int64_t countLevelOneElementsWithLayout(const DisplayLayout& layout);

    // Storage-purge callbacks, on the purge service's thread.
    std::int64_t purgeableSpace(PurgeUrgency urgency);
    std::uint64_t purge(PurgeUrgency urgency);
    std::uint64_t periodicPurge();

    // Plain accessors; nothing else happens in them.
    const std::shared_ptr<IPCListener>& publicListener() const { return publicListener_; }
    const std::shared_ptr<KVConnectionManager>& connectionManager() const { return connectionManager_; }
    const std::shared_ptr<KVSessionManager>& sessionManager() const { return sessionManager_; }
    const std::shared_ptr<KVApplicationStateMonitor>& applicationStateMonitor() const {
        return applicationStateMonitor_;
    }
    const std::shared_ptr<CallObserver>& callObserver() const { return callObserver_; }
    const std::shared_ptr<KVStatusBarAssertion>& statusBarAssertion() const { return statusBarAssertion_; }
    SerialQueue& dataProviderQueue() { return dataProviderQueue_; }
    const std::shared_ptr<BulletinConnection>& dataProviderConnection() const {
        return dataProviderConnection_;
    }
    const std::shared_ptr<BulletinProxy>& dataProviderProxy() const { return dataProviderProxy_; }
    std::shared_ptr<DisplayLayoutMonitor> layoutMonitor() const { return layoutMonitor_.copy(); }
    void setLayoutMonitor(std::shared_ptr<DisplayLayoutMonitor> monitor) {
        layoutMonitor_.set(std::move(monitor));
    }

    bool isMicrophoneRecording() const { return microphoneRecording_; }
    void setMicrophoneRecording(bool recording) { microphoneRecording_ = recording; }
    bool isCameraRecording() const { return cameraRecording_; }
    void setCameraRecording(bool recording) { cameraRecording_ = recording; }
    bool deviceLocked() const { return deviceLocked_; }
    void setDeviceLocked(bool locked) { deviceLocked_ = locked; }
    std::int64_t levelOneElementCount() const { return levelOneElementCount_; }
    void setLevelOneElementCount(std::int64_t count) { levelOneElementCount_ = count; }
    NotificationToken lockToResetToken() const { return lockToResetToken_; }

    Guarded<std::set<std::string>>& exemptBundleIdentifiers() { return exemptBundleIdentifiers_; }
    Guarded<std::set<std::string>>& exemptWithMicRecordingEnabledBundleIdentifiers() {
        return exemptWithMicRecordingEnabledBundleIdentifiers_;
    }
    Guarded<Dictionary>& lastBackgroundDateByBundleIdentifier() {
        return lastBackgroundDateByBundleIdentifier_;
    }
    Guarded<Dictionary>& currentAvailableExtensions() { return currentAvailableExtensions_; }
    Guarded<std::shared_ptr<SystemAlert>>& userNotificationStopRecording() {
        return userNotificationStopRecording_;
    }
    Guarded<std::optional<PhotoAsset>>& photoAsset() { return photoAsset_; }
    Guarded<std::optional<Bytes>>& currentHostAppImage() { return currentHostAppImage_; }
    Guarded<std::optional<Bytes>>& currentExtensionAppImage() { return currentExtensionAppImage_; }
    Guarded<std::optional<std::string>>& currentExtensionDisplayName() {
        return currentExtensionDisplayName_;
    }

  private:
    KVRecordingManager(const Platform& platform, SessionFactory createSession);
    void registerWithPlatform();
    void setUpDeviceLockNotifications();
    void blankedScreenChanged(NotificationToken token);
    void connectBulletins();
    void registerPurgeCallbacks();
    void clearSystemRecordingUI(const SessionRef& session);
    std::string localized(std::string_view key) const;
    /// Whether an engineer set the preference, whatever it holds; `name` is for the log.
    bool isEngineersPreferencePresent(const char* key, const char* name) const;

    // The steps of a start. Those that give a boolean have answered the client when it is false.
    bool isClientAllowedToStart(const StartRequest& request);
    void continueStart(const StartRequestRef& request);
    bool isDeviceReadyFor(const StartRequest& request);
    bool doesUserConsent(const StartRequest& request);
    bool isScreenFreeFor(const StartRequest& request);
    bool prepareBroadcast(const StartRequest& request);
    void configureSession(const StartRequest& request);
    void frontmostSession(const SessionRef& session, std::function<void(std::int32_t)> applicationPID);
    void recordingStarted(const StartRequest& request);
    bool isStatusBarHidden() const;
    void showStatusBar(const StartRequest& request);
    void checkAndPlaySystemRecordSound(const SessionRef& session, bool isRecordingOn);

    SystemAlertContent acknowledgementAlert(const RecordingSession& session, bool isBroadcast) const;
    SystemAlertContent acknowledgementButtons(bool isBroadcast) const;
    void userConsented(const SessionRef& session);
    void userConsentedToLess(const SessionRef& session);

    void showOnAlertQueue(std::function<void(KVRecordingManager&)> show);
    void showFailureAlert(std::string_view messageKey, const OptionalError& error);
    void currentSessionStopped(const std::optional<URL>& movieURL);
    void saveFinishedMovie(const std::optional<URL>& movieURL, const std::optional<URL>& mixedURL,
                           const ErrorHandler& completion);
    void removeSavedFile(const URL& url, ErrorHandler completion);
    /// Whether somebody follows what the photo library is given.
    bool isPhotoLibraryChannelEnabled() const;
    void displayScreenRecorderBulletinWithURL(const std::string& localIdentifier);

    /// What must come to its end before the process does. Held by every stop and save under way; calls what
    /// it was given when the last of them is over.
    struct Work {
        ~Work() {
            if (onEnd) onEnd();
        }
        std::function<void()> onEnd;  // set by the one who has taken it out of the manager
    };
    using WorkRef = std::shared_ptr<Work>;
    /// None once the process is about to end.
    WorkRef work() const { return work_.copy(); }
    bool isTerminating() const { return !work(); }
    /// `handler`, which may be none, holding the work until it is dropped.
    template <typename... Arguments>
    std::function<void(Arguments...)> endingWork(std::function<void(Arguments...)> handler) const {
        return [work = work(), handler = std::move(handler)](Arguments... arguments) {
            if (handler) handler(arguments...);
        };
    }
    void finishRecordings(const WorkRef& work);
    void finishRecording(const SessionRef& session, const WorkRef& work);
    std::int32_t callingProcess() const;
    ErrorHandler holding(const std::optional<URL>& movieURL, ErrorHandler completion);
    MovieHandler handingOver(MovieHandler handler);
    bool mayCallerSave(const URL& movieURL) const;
    bool isBeingWritten(const URL& movieURL) const;

    const Platform platform_;
    const std::shared_ptr<KVLocalization> localization_;
    const std::shared_ptr<KVUserErrors> errors_;
    const std::shared_ptr<KVTemporaryFileStore> fileStore_;

    const std::shared_ptr<KVAudioMixUtility> mixer_;
    Guarded<WorkRef> work_{std::make_shared<Work>()};
    MoviesInUse moviesInUse_;
    std::shared_ptr<KVConnectionManager> connectionManager_;
    std::shared_ptr<IPCListener> publicListener_;
    std::shared_ptr<KVSessionManager> sessionManager_;
    std::shared_ptr<KVApplicationStateMonitor> applicationStateMonitor_;
    std::shared_ptr<CallObserver> callObserver_;
    std::shared_ptr<KVStatusBarAssertion> statusBarAssertion_;
    SerialQueue dataProviderQueue_{"com.quillon.kelvod.bulletinboard"};
    std::shared_ptr<BulletinConnection> dataProviderConnection_;
    std::shared_ptr<BulletinProxy> dataProviderProxy_;
    std::once_flag layoutMonitorCreated_;
    Guarded<std::shared_ptr<DisplayLayoutMonitor>> layoutMonitor_;

    std::atomic<bool> microphoneRecording_{false};
    std::atomic<bool> cameraRecording_{false};
    std::atomic<bool> deviceLocked_{false};
    std::atomic<std::int64_t> levelOneElementCount_{0};
    std::atomic<NotificationToken> lockToResetToken_{0};

    Guarded<std::set<std::string>> exemptBundleIdentifiers_;
    Guarded<std::set<std::string>> exemptWithMicRecordingEnabledBundleIdentifiers_;
    Guarded<Dictionary> lastBackgroundDateByBundleIdentifier_;
    Guarded<Dictionary> currentAvailableExtensions_;
    Guarded<std::shared_ptr<SystemAlert>> userNotificationStopRecording_;
    Guarded<std::optional<PhotoAsset>> photoAsset_;
    Guarded<std::optional<Bytes>> currentHostAppImage_;
    Guarded<std::optional<Bytes>> currentExtensionAppImage_;
    Guarded<std::optional<std::string>> currentExtensionDisplayName_;
};

}  // namespace kelvo
