#include "platform/linux/device/LinuxPlatform.h"

#include "platform/linux/absent/AbsentServices.h"
#include "platform/linux/analytics/AnalyticsLog.h"
#include "platform/linux/bundles/LinuxBundleService.h"
#include "platform/linux/bundles/LocaleLanguages.h"
#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "platform/linux/library/LinuxPhotoLibrary.h"
#include "platform/linux/media_loader/LoadedMediaService.h"
#include "platform/linux/notifications/LinuxNotificationCenter.h"
#include "platform/linux/pulse/PulseAudioService.h"
#include "platform/linux/settings/DeviceFile.h"
#include "platform/linux/settings/InCarDisplayFile.h"
#include "platform/linux/settings/JsonPreferences.h"
#include "platform/linux/sounds/PulseSystemSounds.h"
#include "platform/linux/storage/VolumeWatcher.h"
#include "platform/linux/system/KernelRandom.h"
#include "platform/linux/system/SystemClock.h"
#include "platform/linux/text/UnicodeTextFolding.h"
#include "platform/linux/x11/X11Applications.h"
#include "platform/linux/x11/X11DisplayLayout.h"
#include "platform/linux/x11/X11RenderServer.h"
#include "platform/linux/x11/X11Screen.h"

#include <unistd.h>

namespace kelvo {

Platform linuxPlatform(const std::shared_ptr<const DeviceRoot>& root, const std::string& storePath,
                       bool savesToUsersVideos) {
    Platform platform;
    platform.processIdentifier = ::getpid();
    platform.clock = std::make_shared<SystemClock>();
    platform.random = std::make_shared<KernelRandom>();
    platform.mainQueue = std::make_shared<MainQueue>(*platform.clock);
    platform.fileSystem = std::make_shared<LinuxFileSystem>(root);
    platform.textFolding = std::make_shared<UnicodeTextFolding>();
    platform.languages = std::make_shared<LocaleLanguages>();
    platform.bundles =
        std::make_shared<LinuxBundleService>(root, platform.languages, DesktopFolders::ofProcess());
    platform.preferences = std::make_shared<JsonPreferences>(root);
    platform.device = std::make_shared<DeviceFile>(*root, [] { return x11::nativeScreenOrientation(""); });
    platform.notifications = std::make_shared<LinuxNotificationCenter>(root);
    platform.storagePurge = std::make_shared<VolumeWatcher>(platform.fileSystem, platform.clock, storePath);
    platform.audio = std::make_shared<pulse::PulseAudioService>(platform.clock);
    platform.calls = std::make_shared<SilentCallObserver>();
    platform.restrictions = std::make_shared<UnrestrictedProfile>();
    platform.displayLayout = std::make_shared<x11::X11DisplayLayout>("");
    const auto screen = std::make_shared<x11::X11Screen>("");
    platform.screenCapture = screen;
    platform.displayMirroring = screen;
    platform.renderServer = std::make_shared<x11::X11RenderServer>("");
    platform.analytics = std::make_shared<AnalyticsLog>(root->hostPath(AnalyticsLog::kPath), platform.clock);
    platform.bulletins = std::make_shared<InvisibleBulletins>();
    platform.media =
        std::make_shared<LoadedMediaService>(platform.fileSystem, LoadedMediaService::usualFolders());
    platform.ipc = std::make_shared<SocketTransport>(root, platform.bundles);
    platform.photoLibrary = std::make_shared<LinuxPhotoLibrary>(
        root, screenRecordingsFolder(*root, savesToUsersVideos), platform.random);
    platform.sounds = std::make_shared<PulseSystemSounds>(root);
    platform.applications = std::make_shared<x11::X11Applications>("", platform.bundles);
    platform.accessibility = std::make_shared<UnreadScreen>();
    platform.inCarDisplay = std::make_shared<InCarDisplayFile>(root);
    return platform;
}

}  // namespace kelvo
