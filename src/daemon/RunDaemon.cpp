#include "daemon/RunDaemon.h"

#include "base/KVLog.h"
#include "daemon/KVRecordingManager.h"
#include "daemon/LibraryService.h"

#include <future>
#include <utility>

namespace kelvo {
namespace {

/// The process's one manager.
Guarded<std::shared_ptr<KVRecordingManager>> theRecordingManager;

}  // namespace

int runDaemon(const Platform& platform, SessionFactory createSession, const std::function<void()>& ready) {
    KVLog("kelvod Starting!");
    const auto manager = KVRecordingManager::create(platform, std::move(createSession));
    theRecordingManager.set(manager);
    // Before the first client, who might fill the store.
    const auto library =
        LibraryService::create(platform, [weakManager = std::weak_ptr(manager)](const std::string& name) {
            const auto current = weakManager.lock();
            return current && current->isMovieInUse(name);
        });
    manager->finishStartup();
    if (ready) ready();
    platform.mainQueue->run();
    // Before the process's queues go, which the manager's services may still use.
    theRecordingManager.set(nullptr);
    return -1;
}

void endDaemon(const Platform& platform, std::chrono::nanoseconds patience) {
    if (const auto manager = theRecordingManager.copy()) {
        platform.alerts->close();
        const auto over = std::make_shared<std::promise<void>>();
        manager->finishForTermination([over] { over->set_value(); });
        if (over->get_future().wait_for(patience) != std::future_status::ready)
            KVLog("kelvod ends before everything is saved; the rest is in the store");
    }
    platform.mainQueue->stop();
}

}  // namespace kelvo
