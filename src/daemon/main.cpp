#include "daemon/Options.h"
#include "daemon/RunDaemon.h"
#include "ipc/ShellAlerts.h"
#include "platform/linux/absent/AbsentServices.h"
#include "platform/linux/bundles/LinuxBundleService.h"
#include "platform/linux/bundles/LocaleLanguages.h"
#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/files/WritableDirectory.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "platform/linux/log/JournalLog.h"
#include "platform/linux/log/Readiness.h"
#include "platform/linux/log/StderrLog.h"
#include "platform/linux/media_loader/LoadedMediaService.h"
#include "platform/linux/notifications/LinuxNotificationCenter.h"
#include "platform/linux/pulse/PulseAudioService.h"
#include "platform/linux/settings/DeviceFile.h"
#include "platform/linux/settings/JsonPreferences.h"
#include "platform/linux/storage/VolumeWatcher.h"
#include "platform/linux/system/InstanceLock.h"
#include "platform/linux/system/KernelRandom.h"
#include "platform/linux/system/Resources.h"
#include "platform/linux/system/SystemClock.h"
#include "platform/linux/system/TerminationSignals.h"
#include "platform/linux/text/UnicodeTextFolding.h"
#include "platform/linux/x11/X11RenderServer.h"
#include "platform/linux/x11/X11Screen.h"
#include "session/KVRecordingSession.h"
#include "support/KVTemporaryFileStore.h"

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <sys/stat.h>
#include <unistd.h>

namespace kelvo {
namespace {

constexpr const char* kLockPath = "/run/kelvod/lock";

/// The one place that knows on which platform the daemon runs.
Platform linuxPlatform(const std::shared_ptr<const DeviceRoot>& root) {
    Platform platform;
    platform.processIdentifier = ::getpid();
    platform.clock = std::make_shared<SystemClock>();
    platform.random = std::make_shared<KernelRandom>();
    platform.mainQueue = std::make_shared<MainQueue>(*platform.clock);
    platform.fileSystem = std::make_shared<LinuxFileSystem>(root);
    platform.textFolding = std::make_shared<UnicodeTextFolding>();
    platform.languages = std::make_shared<LocaleLanguages>();
    platform.bundles = std::make_shared<LinuxBundleService>(root, platform.languages);
    platform.preferences = std::make_shared<JsonPreferences>(root);
    platform.device = std::make_shared<DeviceFile>(*root, [] { return x11::nativeScreenOrientation(""); });
    platform.notifications = std::make_shared<LinuxNotificationCenter>(root);
    platform.storagePurge = std::make_shared<VolumeWatcher>(platform.fileSystem, platform.clock,
                                                            KVTemporaryFileStore::_srTempPath());
    platform.audio = std::make_shared<pulse::PulseAudioService>(platform.clock);
    platform.calls = std::make_shared<SilentCallObserver>();
    platform.restrictions = std::make_shared<UnrestrictedProfile>();
    platform.displayLayout = std::make_shared<UnchangingDisplayLayout>();
    const auto screen = std::make_shared<x11::X11Screen>("");
    platform.screenCapture = screen;
    platform.displayMirroring = screen;
    platform.renderServer = std::make_shared<x11::X11RenderServer>("");
    platform.analytics = std::make_shared<UngatheredAnalytics>();
    platform.bulletins = std::make_shared<InvisibleBulletins>();
    platform.media =
        std::make_shared<LoadedMediaService>(platform.fileSystem, LoadedMediaService::usualFolders());
    platform.ipc = std::make_shared<SocketTransport>(root, platform.bundles);
    platform.alerts = ShellAlerts::create(platform.ipc);
    platform.photoLibrary = std::make_shared<MissingPhotoLibrary>();
    platform.sounds = std::make_shared<SilentSystemSounds>();
    platform.applications = std::make_shared<UnwatchedApplications>();
    platform.accessibility = std::make_shared<UnreadScreen>();
    platform.inCarDisplay = std::make_shared<NoInCarDisplay>();
    return platform;
}

int cannotStart(const std::string& reason, int status) {
    std::fprintf(stderr, "kelvod: %s\n", reason.c_str());
    return status;
}

int cannotUseRoot(const Options& options, const KVError& error) {
    return cannotStart("cannot use the root " + options.root + ": " + error.localizedDescription(), 1);
}

int run(const Options& options) {
    std::atomic<bool> isTerminated{false};
    TerminationSignals signals;
    ::umask(S_IRWXG | S_IRWXO);  // recordings are their owner's alone
    if (options.log == Options::Log::standardError) setLogSink(std::make_shared<StderrLog>());
    if (options.log == Options::Log::journal) setLogSink(std::make_shared<JournalLog>());
    const auto root = std::make_shared<const DeviceRoot>(
        options.root, options.resourceFolder.empty() ? installedResourceFolder() : options.resourceFolder);
    const auto lock = InstanceLock::acquire(root->hostPath(kLockPath));
    if (!lock && lock.error().code() == EWOULDBLOCK) {
        return cannotStart("another kelvod runs on the root " + options.root, 1);
    }
    if (!lock) return cannotUseRoot(options, lock.error());
    // A root that cannot be written is better known now than when somebody wants to record.
    const OptionalError error = makeWritableDirectory(root->hostPath(KVTemporaryFileStore::_srTempPath()));
    if (error) return cannotUseRoot(options, *error);
    const Platform platform = linuxPlatform(root);

    signals.watch([&isTerminated, mainQueue = platform.mainQueue] {
        isTerminated = true;
        mainQueue->stop();
    });
    const int status = runDaemon(platform, recordingSessionFactory(platform), reportReadiness);
    return isTerminated ? 0 : status;
}

}  // namespace
}  // namespace kelvo

int main(int argumentCount, char** arguments) {
    using kelvo::Options;
    const auto options =
        Options::parse({arguments + 1, static_cast<std::size_t>(argumentCount > 0 ? argumentCount - 1 : 0)});
    if (!options) return kelvo::cannotStart(options.error().localizedDescription(), 2);
    if (options->action == Options::Action::showHelp) return std::fputs(Options::helpText(), stdout) < 0;
    if (options->action == Options::Action::showVersion) return std::puts("kelvod " KELVO_VERSION) < 0;
    return kelvo::run(*options);
}
