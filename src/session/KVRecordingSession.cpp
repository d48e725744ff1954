#include "session/KVRecordingSession.h"

#include "base/KVLog.h"
#include "media/KVCaptureManager.h"
#include "media/KVMovieWriter.h"

#include <utility>

namespace kelvo {
namespace {

constexpr std::string_view kFullResolutionKey = "KVFullResCapture";
constexpr double kLongestSide = 1920;
constexpr double kLongestSideOfSmallTablet = 1600;
constexpr std::int64_t kSmallTabletChip = 0x8960;

}  // namespace

std::shared_ptr<KVRecordingSession> KVRecordingSession::create(std::string bundleID, Services services) {
    // The constructor is not public, so that a session is always shared.
    return std::shared_ptr<KVRecordingSession>(
        new KVRecordingSession(std::move(bundleID), std::move(services)));
}

KVRecordingSession::KVRecordingSession(std::string bundleID, Services services)
    : bundleID_(std::move(bundleID)), services_(std::move(services)) {}

void KVRecordingSession::setWindowSize(const Size& size) {
    originalWindowSize_.set(size);
    windowSize_.set(_maximumSizeWithSize(size));
}

Size KVRecordingSession::_maximumSizeWithSize(const Size& size) const {
    const Value fullResolution =
        services_.platform.preferences->value(kFullResolutionKey, kPreferencesDomain);
    if (fullResolution.asBool().value_or(false)) {
        KVLog("full res capture enabled");
        return size;
    }
    const bool isTablet = services_.platform.device->idiom() == DeviceIdiom::tablet;
    const double limit = isTablet && chipId() == kSmallTabletChip ? kLongestSideOfSmallTablet : kLongestSide;
    Size limited = size;
    if (limited.height > limit) limited = {limited.width * (limit / limited.height), limit};
    if (limited.width > limit) limited = {limit, limited.height * (limit / limited.width)};
    return limited;
}

std::int64_t KVRecordingSession::chipId() const {
    if (chipId_ == 0) chipId_ = services_.platform.device->chipIdentifier();
    return chipId_;
}

bool KVRecordingSession::isNativeScreenOrientationPortrait() const {
    const auto orientation = services_.platform.device->mainScreenOrientation();
    return !orientation || *orientation == 0.0F;
}

bool KVRecordingSession::sessionWasResumed() const {
    return timeline_.copy().sessionWasResumed;
}
MediaTime KVRecordingSession::firstSampleTimestamp() const {
    return timeline_.copy().firstSampleTimestamp;
}
MediaTime KVRecordingSession::lastSampleTimestamp() const {
    return timeline_.copy().lastSampleTimestamp;
}
MediaTime KVRecordingSession::sampleTimeOffset() const {
    return timeline_.copy().sampleTimeOffset;
}

void KVRecordingSession::notifyRecordingMayBeStopped() {
    if (const auto writer = movieWriter()) writer->notifyRecordingMayBeStopped();
}

void KVRecordingSession::notifyRecordingResumed() {
    if (const auto writer = movieWriter()) writer->notifyRecordingResumed();
}

SessionFactory recordingSessionFactory(const Platform& platform) {
    KVRecordingSession::Services services;
    services.platform = platform;
    services.store =
        std::make_shared<KVTemporaryFileStore>(platform.fileSystem, platform.textFolding, platform.clock);
    services.localization = std::make_shared<KVLocalization>(platform.bundles, platform.languages);
    services.errors = std::make_shared<KVUserErrors>(services.localization);
    services.captureManager = KVCaptureManager::sharedManager(platform);
    const KVMovieWriter::Services writing{platform.media, services.store, platform.preferences,
                                          platform.device};
    services.createMovieWriter = [writing](const Size& windowSize, const std::string& outputPath) {
        return KVMovieWriter::create(windowSize, outputPath, writing);
    };
    return [services](const std::string& bundleID) { return KVRecordingSession::create(bundleID, services); };
}

}  // namespace kelvo
