#include "base/KVLog.h"
#include "daemon/KVRecordingManager.h"

namespace kelvo {
namespace {

constexpr std::string_view kPurgeServiceName = "com.quillon.kelvod-cache-delete";
constexpr double kOneDay = 86400;
constexpr PurgeUrgency kUrgencyToDropEverything = 3;

}  // namespace

void KVRecordingManager::registerPurgeCallbacks() {
    const auto weakSelf = weak_from_this();
    StoragePurgeCallbacks callbacks;
    callbacks.purgeableSpace = [weakSelf](PurgeUrgency urgency) {
        const auto self = weakSelf.lock();
        return self ? self->purgeableSpace(urgency) : 0;
    };
    callbacks.purge = [weakSelf](PurgeUrgency urgency) {
        const auto self = weakSelf.lock();
        return self ? self->purge(urgency) : 0;
    };
    callbacks.cancel = [](std::uint64_t argument) { return argument; };
    callbacks.periodic = [weakSelf]() {
        const auto self = weakSelf.lock();
        return self ? self->periodicPurge() : 0;
    };
    platform_.storagePurge->registerCallbacks(kPurgeServiceName, std::move(callbacks));
}

std::int64_t KVRecordingManager::purgeableSpace(PurgeUrgency) {
    KVLog("KVRecordingManager: cache delete purgeable space callback");
    return fileStore_->_srSizeOfTempDir(nullptr);
}

std::uint64_t KVRecordingManager::purge(PurgeUrgency urgency) {
    KVLog("KVRecordingManager: cache delete purge callback");
    const SessionRef session = sessionManager_->getCurrentRecordingSession();
    if (urgency < kUrgencyToDropEverything) {
        // Without a session nothing is purged, low on space or not: that is how it is meant to be.
        if (!session || session->isRecording()) return 0;
        return fileStore_->_srDeleteFilesOlderThanTimeToLiveInSeconds(kOneDay);
    }
    if (session && session->isRecording()) {
        sessionManager_->stopRecordingSession(session, 0, 0, nullptr);
        recordingSessionStoppedWithError(
            session, errors_->kvUserErrorForCode(kRecordingErrorInsufficientStorage), std::nullopt);
    }
    return fileStore_->_srDeleteAllTempFiles();
}

std::uint64_t KVRecordingManager::periodicPurge() {
    KVLog("KVRecordingManager: cache delete periodic callback");
    return fileStore_->_srDeleteFilesOlderThanTimeToLiveInSeconds(kOneDay);
}

}  // namespace kelvo
