#include "daemon/RunDaemon.h"

#include "base/KVLog.h"
#include "daemon/KVRecordingManager.h"
#include "daemon/LibraryService.h"

#include <utility>

namespace kelvo {
namespace {

/// The process's one manager.
std::shared_ptr<KVRecordingManager> theRecordingManager;

}  // namespace

int runDaemon(const Platform& platform, SessionFactory createSession, const std::function<void()>& ready) {
    KVLog("kelvod Starting!");
    theRecordingManager = KVRecordingManager::create(platform, std::move(createSession));
    // Before the first client, who might fill the store.
    const auto library = LibraryService::create(platform);
    theRecordingManager->finishStartup();
    if (ready) ready();
    platform.mainQueue->run();
    // Before the process's queues go, which the manager's services may still use.
    theRecordingManager.reset();
    return -1;
}

}  // namespace kelvo
