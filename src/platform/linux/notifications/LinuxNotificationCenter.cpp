#include "platform/linux/notifications/LinuxNotificationCenter.h"

#include "base/KVLog.h"
#include "base/ThreadName.h"
#include "platform/linux/notifications/LoginSession.h"
#include "platform/linux/notifications/StateFiles.h"

#include <array>
#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>
#include <utility>

namespace kelvo {
namespace {

constexpr std::string_view kStateFolder = "/run/kelvod/notifications";

}  // namespace

LinuxNotificationCenter::LinuxNotificationCenter(std::shared_ptr<const DeviceRoot> root)
    : root_(std::move(root)), stopEvent_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

LinuxNotificationCenter::~LinuxNotificationCenter() {
    ::eventfd_write(stopEvent_.get(), 1);
    std::thread watcher = watcher_.exchange({});
    if (watcher.joinable()) watcher.join();
}

NotificationToken LinuxNotificationCenter::registerForNotification(std::string_view name,
                                                                   QueuePriority priority, Handler handler) {
    const NotificationToken token = registry_.add(name, priority, std::move(handler));
    watcher_.with([this](std::thread& watcher) {
        if (!watcher.joinable()) watcher = std::thread([this] { watch(); });
    });
    return token;
}

std::uint64_t LinuxNotificationCenter::state(NotificationToken token) {
    return registry_.state(token);
}

void LinuxNotificationCenter::removeObservers(std::string_view name) {
    registry_.remove(name);
}

void LinuxNotificationCenter::watch() {
    nameCurrentThread("kelvo.notify");
    StateFiles files(root_->hostPath(kStateFolder));
    std::unique_ptr<LoginSession> session = LoginSession::open();
    postInitialStates(files, session.get());
    while (true) {
        std::array<pollfd, 3> sources{
            {{stopEvent_.get(), POLLIN, 0}, {files.descriptor(), POLLIN, 0}, {-1, 0, 0}}};
        int timeout = -1;
        if (session) {
            sources[2] = {session->descriptor(), session->events(), 0};
            if (const auto due = session->timeout()) timeout = static_cast<int>(due->count());
        }
        ::poll(sources.data(), sources.size(), timeout);
        if (sources[0].revents != 0) return;
        if (sources[1].revents != 0) handleStateFiles(files, session != nullptr);
        if (session) handleLoginSession(session);
    }
}

/// A state that was set before anybody watched fires once, so that a screen that is blank already counts.
void LinuxNotificationCenter::postInitialStates(const StateFiles& files, const LoginSession* session) {
    if (session != nullptr && session->isLocked()) registry_.post(kBlankedScreenNotification, 1);
    for (const std::string& name : files.names()) {
        if (session != nullptr && name == kBlankedScreenNotification) continue;
        if (const std::uint64_t state = files.state(name); state != 0) registry_.post(name, state);
    }
}

void LinuxNotificationCenter::handleLoginSession(std::unique_ptr<LoginSession>& session) {
    const bool wasLocked = session->isLocked();
    const bool isAlive = session->process();
    if (session->isLocked() != wasLocked) {
        registry_.post(kBlankedScreenNotification, session->isLocked() ? 1 : 0);
    }
    if (isAlive) return;
    KVLogError("lost the system bus; the screen's lock state is read from its state file now");
    session.reset();
}

void LinuxNotificationCenter::handleStateFiles(StateFiles& files, bool hasLoginSession) {
    for (const std::string& name : files.takeChangedNames()) {
        if (hasLoginSession && name == kBlankedScreenNotification) continue;
        registry_.post(name, files.state(name));
    }
}

}  // namespace kelvo
