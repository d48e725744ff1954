#include "platform/linux/ipc/SocketLoop.h"

#include "base/SpareTime.h"
#include "base/ThreadName.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <sys/timerfd.h>
#include <utility>
#include <vector>

namespace kelvo {
namespace {

// Watchers count from here.
constexpr SocketLoop::Token kWakeToken = 0;
constexpr SocketLoop::Token kTimerToken = 1;
constexpr std::size_t kMostThreads = 2;

/// The loop whose thread the calling one is.
thread_local const void* loopOfThread = nullptr;

void watchOurs(int epoll, int descriptor, SocketLoop::Token token, std::uint32_t events) {
    epoll_event event{};
    event.events = events;
    event.data.u64 = token;
    ::epoll_ctl(epoll, EPOLL_CTL_ADD, descriptor, &event);
}

}  // namespace

/// What the threads use; it may outlive the loop when that goes on one of them.
struct SocketLoop::Shared {
    explicit Shared(Clock itsClock) : clock(std::move(itsClock)) {
        watchOurs(epoll.get(), wake.get(), kWakeToken, EPOLLIN);
        watchOurs(epoll.get(), timer.get(), kTimerToken, EPOLLIN | EPOLLET);  // never read, wakes each time
    }

    const Clock clock;
    UniqueFd epoll{::epoll_create1(EPOLL_CLOEXEC)};
    UniqueFd wake{::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)};
    UniqueFd timer{::timerfd_create(CLOCK_MONOTONIC, TFD_CLOEXEC | TFD_NONBLOCK)};
    std::atomic<bool> isStopped{false};
    std::mutex mutex;
    std::map<Token, std::shared_ptr<SocketWatcher>> watchers;
    Token lastToken = kTimerToken;
    std::mutex tickMutex;
    std::optional<SocketWatcher::Moment> nextTick;
    /// The thread that runs a task, or will; and the task, which is that thread's own.
    std::atomic<std::thread::id> runner{};
    std::function<void()> afterwards;
    std::mutex attendantsMutex;
    std::map<std::shared_ptr<SocketBell>, std::thread> attendants;

    std::shared_ptr<SocketWatcher> watcher(Token token) {
        const std::lock_guard lock(mutex);
        const auto found = watchers.find(token);
        return found == watchers.end() ? nullptr : found->second;
    }

    void tickAt(SocketWatcher::Moment moment) {
        const std::lock_guard lock(tickMutex);
        if (nextTick && *nextTick <= moment) return;
        nextTick = moment;
        const auto left = std::max(std::chrono::nanoseconds(moment - clock()), std::chrono::nanoseconds(1));
        const auto seconds = std::chrono::floor<std::chrono::seconds>(left);
        itimerspec time{};
        time.it_value.tv_sec = seconds.count();
        time.it_value.tv_nsec = (left - seconds).count();
        ::timerfd_settime(timer.get(), 0, &time, nullptr);
    }

    bool isTickDue(SocketWatcher::Moment now) {
        const std::lock_guard lock(tickMutex);
        if (!nextTick || *nextTick > now) return false;
        nextTick.reset();
        return true;
    }

    void tickWhenDue() {
        const auto now = clock();
        if (!isTickDue(now)) return;
        std::vector<std::shared_ptr<SocketWatcher>> all;
        {
            const std::lock_guard lock(mutex);
            for (const auto& [token, each] : watchers)
                all.push_back(each);
        }
        for (const auto& each : all) {
            if (const auto next = each->tick(now)) tickAt(*next);
        }
    }

    void runWhatIsLeft() {
        if (runner != std::this_thread::get_id()) return;
        if (afterwards) {
            const SpareTime spare;
            afterwards();
            afterwards = nullptr;
        }
        runner = std::thread::id();
    }
};

SocketLoop::SocketLoop(Clock clock) : shared_(std::make_shared<Shared>(std::move(clock))) {}

SocketLoop::~SocketLoop() {
    stopThreads();
}

/// One that goes on a thread of its own lets that one end by itself.
void SocketLoop::stopThreads() {
    shared_->isStopped = true;
    ::eventfd_write(shared_->wake.get(), 1);
    std::vector<std::thread> threads;
    std::map<std::shared_ptr<SocketBell>, std::thread> attendants;
    {
        const std::lock_guard lock(startMutex_);
        threads.swap(threads_);
    }
    {
        const std::lock_guard lock(shared_->attendantsMutex);
        attendants.swap(shared_->attendants);
    }
    for (const auto& [bell, thread] : attendants)
        bell->stop();
    for (std::thread& thread : threads)
        end(thread);
    for (auto& [bell, thread] : attendants)
        end(thread);
}

void SocketLoop::end(std::thread& thread) {
    if (thread.get_id() == std::this_thread::get_id()) {
        thread.detach();
    } else {
        thread.join();
    }
}

void SocketLoop::stop() {
    stopThreads();
    std::map<Token, std::shared_ptr<SocketWatcher>> watchers;  // destroyed after the lock is free
    const std::lock_guard lock(shared_->mutex);
    watchers.swap(shared_->watchers);
}

void SocketLoop::startThread(std::size_t count) {
    const std::lock_guard lock(startMutex_);
    if (threads_.size() < count && !shared_->isStopped)
        threads_.emplace_back([shared = shared_] { run(shared); });
}

void SocketLoop::attend(const std::shared_ptr<SocketBell>& bell) {
    const std::lock_guard lock(shared_->attendantsMutex);
    if (shared_->isStopped) return;
    shared_->attendants[bell] = std::thread([shared = shared_, bell] {
        attendTo(*bell);
        // Nobody waits for it, unless that is the loop that ends.
        const std::lock_guard innerLock(shared->attendantsMutex);
        const auto own = shared->attendants.extract(bell);
        if (own) own.mapped().detach();
    });
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
    startThread(1);
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
    shared_->tickAt(moment);
}

bool SocketLoop::mayRunAfterwards() {
    if (loopOfThread != shared_.get()) return false;
    std::thread::id nobody;
    if (!shared_->runner.compare_exchange_strong(nobody, std::this_thread::get_id())) return false;
    startThread(kMostThreads);
    return true;
}

void SocketLoop::runAfterwards(std::function<void()> task) {
    shared_->afterwards = std::move(task);
    if (!shared_->afterwards) shared_->runner = std::thread::id();
}

void SocketLoop::attendTo(SocketBell& bell) {
    nameCurrentThread("com.quillon.kelvod.frames");
    while (bell.wait())
        bell.ready();
}

void SocketLoop::run(const std::shared_ptr<Shared>& shared) {
    nameCurrentThread("com.quillon.kelvod.sockets");
    loopOfThread = shared.get();
    std::array<epoll_event, 32> events{};
    while (!shared->isStopped) {
        const int count =
            ::epoll_wait(shared->epoll.get(), events.data(), static_cast<int>(events.size()), -1);
        for (int i = 0; i < count; ++i) {
            const epoll_event& event = events[static_cast<std::size_t>(i)];
            if (const auto watcher = shared->watcher(event.data.u64)) watcher->ready(event.events);
        }
        shared->tickWhenDue();
        shared->runWhatIsLeft();
    }
}

}  // namespace kelvo
