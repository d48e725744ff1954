#include "daemon/Options.h"
#include "daemon/RunDaemon.h"
#include "ipc/ShellAlerts.h"
#include "platform/linux/device/LinuxPlatform.h"
#include "platform/linux/files/WritableDirectory.h"
#include "platform/linux/log/JournalLog.h"
#include "platform/linux/log/Readiness.h"
#include "platform/linux/log/StderrLog.h"
#include "platform/linux/system/DescriptorLimit.h"
#include "platform/linux/system/InstanceLock.h"
#include "platform/linux/system/MemoryUse.h"
#include "platform/linux/system/Resources.h"
#include "platform/linux/system/TerminationSignals.h"
#include "session/KVRecordingSession.h"
#include "support/KVTemporaryFileStore.h"

#include <atomic>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <sys/stat.h>
#include <unistd.h>

namespace kelvo {
namespace {

constexpr const char* kLockPath = "/run/kelvod/lock";

/// How long the end may take: what is left of it after the recordings' share goes to the tear-down.
constexpr std::chrono::milliseconds kPatience{4500};
constexpr unsigned kLongestEnd = 5;

int cannotStart(const std::string& reason, int status) {
    std::fprintf(stderr, "kelvod: %s\n", reason.c_str());
    return status;
}

int cannotUseRoot(const Options& options, const KVError& error) {
    return cannotStart("cannot use the root " + options.root + ": " + error.localizedDescription(), 1);
}

int run(const Options& options) {
    giveMemoryBackEarly();
    std::atomic<bool> isTerminated{false};
    TerminationSignals signals;
    ::umask(S_IRWXG | S_IRWXO);  // recordings are their owner's alone
    if (options.log == Options::Log::standardError) setLogSink(std::make_shared<StderrLog>());
    if (options.log == Options::Log::journal) setLogSink(std::make_shared<JournalLog>());
    setLogsSamples(options.logsSamples);
    raiseDescriptorLimit();
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
    Platform platform = linuxPlatform(root, KVTemporaryFileStore::_srTempPath(), options.savesToUsersVideos);
    platform.alerts = ShellAlerts::create(platform.ipc);

    signals.watch([&isTerminated, platform] {
        isTerminated = true;
        TerminationSignals::exitAfter(kLongestEnd);
        endDaemon(platform, kPatience);
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
