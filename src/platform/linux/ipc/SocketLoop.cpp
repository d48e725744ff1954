#include "platform/linux/ipc/SocketLoop.h"

#include "base/ThreadName.h"

#include <array>
#include <atomic>
#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <vector>

namespace kelvo {
namespace {

constexpr SocketLoop::Token kWakeToken = 0;

}  // namespace

/// What the thread uses; it may outlive the loop when that goes on the thread itself.
struct SocketLoop::Shared {
    explicit Shared(Clock itsClock) : clock(std::move(itsClock)) {}

    const Clock clock;
    UniqueFd epoll{::epoll_create1(EPOLL_CLOEXEC)};
    UniqueFd wake{::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)};
    std::atomic<bool> isStopped{false};
    std::mutex mutex;
    std::map<Token, std::shared_ptr<SocketWatcher>> watchers;
    Token lastToken = kWakeToken;
    std::optional<SocketWatcher::Moment> nextTick;  // the thread's own

    std::shared_ptr<SocketWatcher> watcher(Token token) {
        const std::lock_guard lock(mutex);
        const auto found = watchers.find(token);
        return found == watchers.end() ? nullptr : found->second;
    }

    int timeout() const {
        if (!nextTick) return -1;
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(*nextTick - clock());
        return left.count() > 0 ? static_cast<int>(left.count()) : 0;
    }

    void tickWhenDue() {
        const auto now = clock();
        if (!nextTick || *nextTick > now) return;
        nextTick.reset();
        std::vector<std::shared_ptr<SocketWatcher>> all;
        {
            const std::lock_guard lock(mutex);
            for (const auto& [token, each] : watchers)
                all.push_back(each);
        }
        for (const auto& each : all) {
            const auto next = each->tick(now);
            if (next && (!nextTick || *next < *nextTick)) nextTick = next;
        }
    }
};

SocketLoop::SocketLoop(Clock clock) : shared_(std::make_shared<Shared>(std::move(clock))) {
    epoll_event event{};
    event.events = EPOLLIN;
    event.data.u64 = kWakeToken;
    ::epoll_ctl(shared_->epoll.get(), EPOLL_CTL_ADD, shared_->wake.get(), &event);
}

SocketLoop::~SocketLoop() {
    shared_->isStopped = true;
    ::eventfd_write(shared_->wake.get(), 1);
    if (!thread_.joinable()) return;
    if (thread_.get_id() == std::this_thread::get_id()) {
        thread_.detach();
    } else {
        thread_.join();
    }
}

void SocketLoop::stop() {
    shared_->isStopped = true;
    ::eventfd_write(shared_->wake.get(), 1);
    {
        const std::lock_guard lock(startMutex_);
        if (thread_.joinable()) thread_.join();
    }
    std::map<Token, std::shared_ptr<SocketWatcher>> watchers;  // destroyed after the lock is free
    const std::lock_guard lock(shared_->mutex);
    watchers.swap(shared_->watchers);
}

SocketLoop::Token SocketLoop::add(int descriptor, std::shared_ptr<SocketWatcher> watcher) {
    Token token = 0;
    {
        const std::lock_guard lock(shared_->mutex);
        token = ++shared_->lastToken;
        shared_->watchers.emplace(token, std::move(watcher));
    }
    epoll_event event{};
    event.data.u64 = token;
    event.events = EPOLLONESHOT;
    ::epoll_ctl(shared_->epoll.get(), EPOLL_CTL_ADD, descriptor, &event);
    const std::lock_guard lock(startMutex_);
    if (!thread_.joinable() && !shared_->isStopped)
        thread_ = std::thread([shared = shared_] { run(shared); });
    return token;
}

void SocketLoop::arm(int descriptor, Token token, std::uint32_t events) {
    epoll_event event{};
    event.data.u64 = token;
    event.events = events | EPOLLONESHOT;
    ::epoll_ctl(shared_->epoll.get(), EPOLL_CTL_MOD, descriptor, &event);
}

void SocketLoop::remove(int descriptor, Token token) {
    ::epoll_ctl(shared_->epoll.get(), EPOLL_CTL_DEL, descriptor, nullptr);
    std::shared_ptr<SocketWatcher> removed;  // destroyed after the lock is free
    const std::lock_guard lock(shared_->mutex);
    const auto found = shared_->watchers.find(token);
    if (found == shared_->watchers.end()) return;
    removed = std::move(found->second);
    shared_->watchers.erase(found);
}

SocketWatcher::Moment SocketLoop::now() const {
    return shared_->clock();
}

void SocketLoop::tickAt(SocketWatcher::Moment moment) {
    if (!shared_->nextTick || moment < *shared_->nextTick) shared_->nextTick = moment;
}

void SocketLoop::run(const std::shared_ptr<Shared>& shared) {
    nameCurrentThread("com.quillon.kelvod.sockets");
    std::array<epoll_event, 32> events{};
    while (!shared->isStopped) {
        const int count = ::epoll_wait(shared->epoll.get(), events.data(), static_cast<int>(events.size()),
                                       shared->timeout());
        for (int i = 0; i < count; ++i) {
            const epoll_event& event = events[static_cast<std::size_t>(i)];
            if (const auto watcher = shared->watcher(event.data.u64)) watcher->ready(event.events);
        }
        shared->tickWhenDue();
    }
}

}  // namespace kelvo
