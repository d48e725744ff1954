#include "daemon/KVRecordingManager.h"

#include "base/KVLog.h"

#include <utility>

namespace kelvo {
namespace {

constexpr std::string_view kServiceName = "com.quillon.kelvod";
constexpr std::string_view kBulletinServiceName = "com.quillon.kelvod.bulletinboard";
constexpr std::string_view kSystemEntitlement = "com.quillon.private.kelvo-kit";
/// Never registered; its removal at tear-down is an old habit that stays.
constexpr std::string_view kLockStatusNotification = "com.quillon.mobile.cofferd.lock_status";

}  // namespace

std::shared_ptr<KVRecordingManager> KVRecordingManager::create(const Platform& platform,
                                                               SessionFactory createSession) {
    std::shared_ptr<KVRecordingManager> manager(new KVRecordingManager(platform, std::move(createSession)));
    manager->registerWithPlatform();
    return manager;
}

KVRecordingManager::KVRecordingManager(const Platform& platform, SessionFactory createSession)
    : platform_(platform),
      localization_(std::make_shared<KVLocalization>(platform.bundles, platform.languages)),
      errors_(std::make_shared<KVUserErrors>(localization_)),
      fileStore_(
          std::make_shared<KVTemporaryFileStore>(platform.fileSystem, platform.textFolding, platform.clock)),
      mixer_(std::make_shared<KVAudioMixUtility>(platform.media, platform.clock, errors_)),
      sessionManager_(std::make_shared<KVSessionManager>(std::move(createSession), errors_)) {}

/// The second half of construction: services get weak references to the manager, which a constructor cannot
/// give.
void KVRecordingManager::registerWithPlatform() {
    fileStore_->_srSetupTempDirectory();
    connectionManager_ = std::make_shared<KVConnectionManager>(platform_.ipc, localization_);
    connectionManager_->setDelegate(weak_from_this());
    publicListener_ = platform_.ipc->createListener(kServiceName);
    publicListener_->setDelegate(connectionManager_);
    sessionManager_->setDelegate(weak_from_this());
    applicationStateMonitor_ = std::make_shared<KVApplicationStateMonitor>(platform_.applications);
    callObserver_ = platform_.calls;
    callObserver_->setDelegate(weak_from_this());
    // Engineers record with the screen blank.
    if (!isEngineersPreferencePresent("KVEnableLockedRecording", "enableLockedRecording"))
        setUpDeviceLockNotifications();
    statusBarAssertion_ = std::make_shared<KVStatusBarAssertion>();
    connectBulletins();
    platform_.restrictions->addObserver(weak_from_this());
    registerPurgeCallbacks();
}

KVRecordingManager::~KVRecordingManager() {
    if (const auto monitor = layoutMonitor()) {
        monitor->removeObserver(this);
        monitor->invalidate();
    }
    platform_.notifications->removeObservers(kLockStatusNotification);
    platform_.restrictions->removeObserver(this);
    if (statusBarAssertion_) statusBarAssertion_->invalidateDoubleHeightStatusBar();
    statusBarAssertion_.reset();
}

void KVRecordingManager::finishStartup() {
    publicListener_->resume();
}

SerialQueue& KVRecordingManager::kelvoAlertQueue() {
    static SerialQueue queue("com.kelvokit.alertQueue");
    return queue;
}

void KVRecordingManager::connectBulletins() {
    dataProviderConnection_ = platform_.bulletins->connect(kBulletinServiceName, dataProviderQueue_);
    dataProviderProxy_ = dataProviderConnection_->registerDataProvider(weak_from_this());
    // Bulletins of an earlier process speak of recordings that this one knows nothing of.
    dataProviderProxy_->withdrawAllBulletins();
}

bool KVRecordingManager::clientHasSystemEntitlements() const {
    const auto connection = connectionManager_->getCurrentConnection();
    return connection && holdsEntitlement(*connection, kSystemEntitlement);
}

std::optional<std::string> KVRecordingManager::getCallingConnectionBundleID() const {
    const auto connection = connectionManager_->getCurrentConnection();
    if (!connection) return std::nullopt;
    const BundleRef bundle = localization_->bundleWithPID(connection->processIdentifier());
    if (!bundle || bundle->bundleIdentifier().empty()) return std::nullopt;
    return bundle->bundleIdentifier();
}

SessionRef KVRecordingManager::getCallingConnectionRecordingSession() const {
    return sessionManager_->getRecordingSessionWithBundleIdentifier(
        getCallingConnectionBundleID().value_or(""));
}

}  // namespace kelvo
