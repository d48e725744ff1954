#include "platform/linux/x11/DesktopWatch.h"

#include "base/KVLog.h"
#include "base/ThreadName.h"
#include "platform/linux/x11/XHandshake.h"

#include <algorithm>
#include <cerrno>
#include <poll.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <utility>

namespace kelvo::x11 {
namespace {

constexpr int kRetryMilliseconds = 1000;
/// A window that is dragged tells of each step; one look serves all that come within this time.
constexpr int kGatheringMilliseconds = 30;
constexpr std::size_t kMostProcesses = 256;
/// A desktop on which windows keep coming is looked at again when it has told of them.
constexpr int kMostLooks = 8;
constexpr int kEventTypeMask = 0x7F;

UniqueFd processDescriptor(std::int32_t process) {
    return UniqueFd(static_cast<int>(::syscall(SYS_pidfd_open, process, 0)));
}

bool hasEnded(const UniqueFd& process) {
    pollfd wait{process.get(), POLLIN, 0};
    return ::poll(&wait, 1, 0) > 0;
}

}  // namespace

DesktopWatch::~DesktopWatch() {
    isStopping_ = true;
    wake_.set();
    const auto thread = thread_.copy();
    if (thread) thread->join();
}

void DesktopWatch::setHandler(Handler handler, DesktopView known) {
    const bool isWanted = handler != nullptr;
    task_.set({std::move(handler), std::move(known)});
    wake_.set();
    if (!isWanted) return;
    thread_.with([this](auto& thread) {
        if (!thread) thread = std::make_shared<std::thread>([this] { run(); });
    });
}

void DesktopWatch::run() {
    nameCurrentThread("kelvo.desktop");
    while (!isStopping_) {
        wake_.clear();
        last_.reset();
        const Task task = task_.copy();
        if (task.handler) {
            followProcesses(task.known);
            watch(task.handler);
        } else {
            disconnect();
            processes_.clear();
            wait(-1);
        }
    }
    disconnect();
}

/// Until the handler is another one.
void DesktopWatch::watch(const Handler& handler) {
    bool isReachable = true;
    while (!isStopping_) {
        if (!connect()) {
            if (!wait(0)) return;
            if (std::exchange(isReachable, false))
                KVLogError("%s; what it shows is unknown until it is there",
                           unreachableText(displayName(display_)).c_str());
            report({}, handler);
            if (!wait(kRetryMilliseconds)) return;
            continue;
        }
        isReachable = true;
        auto view = look();
        if (!view) {
            if (connection_->isBroken()) disconnect();
            if (!wait(0)) return;
            continue;
        }
        report(std::move(*view), handler);
        if (!takeEvents() && !wait(-1)) return;
        if (!gather()) return;
        takeEvents();
    }
}

/// The view, with word from the server at whatever changes it from now on; none when it stopped answering.
std::optional<DesktopView> DesktopWatch::look() {
    auto view = reader_->read();
    for (int looks = 1; view && looks < kMostLooks; ++looks) {
        followProcesses(*view);
        // What changed before the server knew of our interest told nothing: one more look.
        if (!reader_->selectEvents()) break;
        view = reader_->read();
    }
    return view;
}

bool DesktopWatch::connect() {
    if (reader_ && !connection_->isBroken()) {
        connection_->tryAgain();
        return true;
    }
    disconnect();
    connection_ = XConnection::open(display_, wake_.descriptor());
    if (connection_) reader_ = DesktopReader::open(*connection_);
    return reader_.has_value();
}

void DesktopWatch::disconnect() {
    reader_.reset();
    connection_.reset();
}

void DesktopWatch::report(DesktopView view, const Handler& handler) {
    dropEndedProcesses();
    addUnseenProcesses(view);
    if (last_ == view) return;
    last_ = view;
    handler(view);
}

void DesktopWatch::followProcesses(const DesktopView& view) {
    for (const DesktopApplication& application : view.applications) {
        if (processes_.contains(application.processIdentifier) || processes_.size() >= kMostProcesses)
            continue;
        if (UniqueFd process = processDescriptor(application.processIdentifier))
            processes_[application.processIdentifier] = std::move(process);
    }
}

void DesktopWatch::addUnseenProcesses(DesktopView& view) const {
    for (const auto& [process, descriptor] : processes_) {
        const bool isSeen = std::ranges::any_of(
            view.applications, [&, id = process](const auto& seen) { return seen.processIdentifier == id; });
        if (!isSeen) view.applications.push_back({process, false, false});
    }
    std::ranges::sort(view.applications, {}, &DesktopApplication::processIdentifier);
}

/// Waits for the server, for the end of a process or for the time to pass; false when the handler may be
/// another.
bool DesktopWatch::wait(int milliseconds) {
    std::vector<pollfd> waits{{wake_.descriptor(), POLLIN, 0}};
    if (connection_) {
        xcb_flush(connection_->raw());
        waits.push_back({xcb_get_file_descriptor(connection_->raw()), POLLIN, 0});
    }
    for (const auto& [process, descriptor] : processes_)
        waits.push_back({descriptor.get(), POLLIN, 0});
    while (::poll(waits.data(), waits.size(), milliseconds) < 0 && errno == EINTR) {
    }
    return waits[0].revents == 0;
}

/// Lets a moment pass, in which further events come; false when the handler may be another.
bool DesktopWatch::gather() {
    pollfd wake{wake_.descriptor(), POLLIN, 0};
    while (::poll(&wake, 1, kGatheringMilliseconds) < 0 && errno == EINTR) {
    }
    return wake.revents == 0;
}

void DesktopWatch::dropEndedProcesses() {
    std::erase_if(processes_, [](const auto& entry) { return hasEnded(entry.second); });
}

/// Says whether there were any, of which libxcb may have read some along with replies.
bool DesktopWatch::takeEvents() {
    bool isAny = false;
    while (const XOwned<xcb_generic_event_t> event{xcb_poll_for_event(connection_->raw())}) {
        isAny = true;
        if ((event->response_type & kEventTypeMask) == XCB_DESTROY_NOTIFY)
            reader_->forget(reinterpret_cast<const xcb_destroy_notify_event_t*>(event.get())->window);
    }
    return isAny;
}

}  // namespace kelvo::x11
