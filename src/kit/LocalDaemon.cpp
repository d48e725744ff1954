#include "kit/LocalDaemon.h"

#include "base/SerialQueue.h"
#include "platform/linux/bundles/LinuxBundleService.h"
#include "platform/linux/bundles/LocaleLanguages.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "platform/linux/ipc/UsualSocket.h"
#include "support/KVLocalization.h"

#include <array>
#include <condition_variable>
#include <dlfcn.h>
#include <filesystem>
#include <mutex>

namespace kelvokit {
namespace {

namespace fs = std::filesystem;

/// The resources near this library: beside it in a build tree, in "share/kelvod" where it is installed.
std::string resourceFolder() {
    Dl_info info{};
    if (::dladdr(reinterpret_cast<void*>(&resourceFolder), &info) == 0) return "/usr/share/kelvod";
    std::error_code ignored;
    const fs::path folder = fs::canonical(info.dli_fname, ignored).parent_path();
    for (const fs::path& candidate :
         std::array{folder / "resources", folder / "../share/kelvod", folder / "../../share/kelvod"}) {
        if (fs::is_directory(candidate, ignored)) return candidate.lexically_normal().string();
    }
    return "/usr/share/kelvod";
}

std::shared_ptr<const kelvo::DeviceRoot> deviceRoot() {
    static const auto root = std::make_shared<const kelvo::DeviceRoot>("/", resourceFolder());
    return root;
}

/// The socket threads of all recorders of the process. Kept for good: a handler may run on one of them, and
/// wait for whatever it likes, while the process ends, which shall not wait for it.
kelvo::SocketTransport& transport() {
    static auto* const shared = std::make_unique<kelvo::SocketTransport>(deviceRoot(), nullptr).release();
    return *shared;
}

std::shared_ptr<kelvo::KVUserErrors> userErrors() {
    static const auto errors = [] {
        const auto languages = std::make_shared<kelvo::LocaleLanguages>();
        const auto bundles = std::make_shared<kelvo::LinuxBundleService>(deviceRoot(), languages);
        return std::make_shared<kelvo::KVUserErrors>(
            std::make_shared<kelvo::KVLocalization>(bundles, languages));
    }();
    return errors;
}

/// Runs one task after another, each after its pause, on a thread that exists once it is needed.
class Timer {
  public:
    ~Timer() {
        const std::lock_guard lock(state_->mutex);
        state_->isOver = true;
        state_->over.notify_all();
    }
    void after(std::chrono::milliseconds pause, std::function<void()> task) {
        queue_.async([state = state_, pause, task = std::move(task)] {
            std::unique_lock lock(state->mutex);
            if (state->over.wait_for(lock, pause, [&] { return state->isOver; })) return;
            lock.unlock();
            task();
        });
    }
    Timer() = default;
    Timer(const Timer&) = delete;
    Timer& operator=(const Timer&) = delete;

  private:
    struct State {
        std::mutex mutex;
        std::condition_variable over;
        bool isOver = false;
    };
    kelvo::SerialQueue queue_{"kelvokit.reconnect"};
    const std::shared_ptr<State> state_ = std::make_shared<State>();
};

/// One at a time: on the thread that received what the daemon sent when that one can be spared, else on the
/// queue's own.
Executor ownQueue() {
    return [queue = std::make_shared<kelvo::SerialQueue>("kelvokit.handlers")](std::function<void()> task) {
        queue->asyncOrSoon(std::move(task));
    };
}

}  // namespace

std::string socketPath(const RecorderOptions& options) {
    return options.socketPath.empty() ? kelvo::usualDaemonSocket() : options.socketPath;
}

RecorderEnvironment localEnvironment(const RecorderOptions& options) {
    return {
        [path = socketPath(options)] { return transport().connectToSocket(path); },
        [timer = std::make_shared<Timer>()](auto pause, auto task) { timer->after(pause, std::move(task)); },
        options.executor ? options.executor : ownQueue(), userErrors()};
}

}  // namespace kelvokit
