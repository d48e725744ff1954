#include "base/KVLog.h"
#include "daemon/KVRecordingManager.h"

#include <utility>

namespace kelvo {
namespace {

constexpr const char* kDeleteAction = "deleteAction";
constexpr std::int64_t kActivationMode = 1;
constexpr std::int64_t kMostMessageLines = 3;

/// A local identifier is a UUID, which something may follow.
URL launchURLOf(const std::string& localIdentifier) {
    return URL("gallery://asset?uuid=" + localIdentifier.substr(0, localIdentifier.find('/')) +
               "&albumname=camera-roll");
}

}  // namespace

void KVRecordingManager::displayScreenRecorderBulletinWithURL(const std::string& localIdentifier) {
    dataProviderProxy_->postBulletin(createBulletinRequestWithAssetURL(localIdentifier), true);
}

/// Only the newest recording can be deleted from a bulletin: one asset is remembered.
BulletinRequest KVRecordingManager::createBulletinRequestWithAssetURL(const std::string& localIdentifier) {
    photoAsset_.set(platform_.photoLibrary->assetWithLocalIdentifier(localIdentifier));
    const URL launchURL = launchURLOf(localIdentifier);
    BulletinRequest request;
    request.sectionIdentifier = sectionIdentifier();
    request.recordIdentifier = "orginalRecordID";  // misspelled: bulletins have always been known by it
    request.title = localized("QUICK_PANEL_TITLE");
    request.message = localized("RECORDING_BULLETIN_MESSAGE");
    request.date = platform_.clock->now();
    request.iconBundlePath = "/System/Library/QuickPanel/Bundles/KelvoKitModule.bundle";
    request.iconName = "SettingsIcon";
    request.defaultActionURL = launchURL;
    request.supplementaryActions = {
        {"viewAction", localized("SYSTEM_RECORDING_LONG_PRESS_VIEW"), kActivationMode, launchURL},
        {kDeleteAction, localized("SYSTEM_RECORDING_LONG_PRESS_DELETE"), kActivationMode, std::nullopt}};
    return request;
}

/// The service opens what is viewed by itself.
void KVRecordingManager::handleBulletinActionResponse(const std::string& actionIdentifier) {
    if (actionIdentifier != kDeleteAction) return;
    const std::optional<PhotoAsset> asset = photoAsset_.exchange(std::nullopt);
    if (!asset) return;
    if (const OptionalError error = platform_.photoLibrary->deleteAsset(*asset)) {
        KVLogError("KVRecordingManager: handleBulletinActionResponse: Error deleting photo asset: %s",
                   error->description().c_str());
    }
}

/// The title in the user's language is the identifier, too.
std::string KVRecordingManager::sectionIdentifier() const {
    return localized("QUICK_PANEL_TITLE");
}

BulletinSection KVRecordingManager::bulletinSection() {
    return {sectionIdentifier(), kMostMessageLines, 0, true, "date", false};
}

}  // namespace kelvo
