#include "platform/linux/ipc/SocketConnection.h"

#include "base/KVLog.h"
#include "platform/IPCBounds.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <sys/epoll.h>
#include <sys/socket.h>
#include <unistd.h>

namespace kelvo {

using namespace ipc_bounds;

SocketConnection::SocketConnection(Side side, UniqueFd socket, std::shared_ptr<SocketLoop> loop,
                                   std::shared_ptr<BundleService> bundles,
                                   std::shared_ptr<const DeviceRoot> root, Task release)
    : ConnectionBase("com.quillon.kelvod.connection"),
      side_(side),
      socket_(std::make_shared<UniqueFd>(std::move(socket))),
      loop_(std::move(loop)),
      peer_(socket_.copy()->get(), std::move(bundles)),
      root_(std::move(root)),
      release_(std::move(release)) {
    if (side_ == Side::server) {
        authentication_.emplace(peer_.user());
        return;
    }
    const std::string greeting = dbus::clientGreeting(::getuid());
    const auto* first = reinterpret_cast<const std::byte*>(greeting.data());
    out_.queue.push_back({Bytes(first, first + greeting.size()), 0, {}, nullptr});
    out_.unsentBytes = greeting.size();
}

URL SocketConnection::urlForPeer(const URL& url) const {
    return url.isFileURL() ? URL::file(root_->hostPath(url.path())) : url;
}

URL SocketConnection::urlFromPeer(const URL& url) const {
    return url.isFileURL() ? URL::file(root_->devicePath(url.path())) : url;
}

SocketConnection::~SocketConnection() {
    // Never resumed, or it would still be held.
    if (const Task release = release_.exchange(nullptr)) release();
}

void SocketConnection::didResume() {
    const Socket held = socket();
    if (!held || token_ != 0) return;
    const auto token =
        loop_->add(held->get(), std::static_pointer_cast<SocketConnection>(shared_from_this()));
    token_ = token;
    // It may have ended while it was being added, before there was a token to remove.
    if (!socket()) return loop_->remove(held->get(), token);
    arm();
}

void SocketConnection::close() {
    const Socket held = socket_.exchange(nullptr);
    if (!held) return;
    if (token_ != 0) loop_->remove(held->get(), token_);
    ::shutdown(held->get(), SHUT_RDWR);
    std::deque<Outgoing> unsent;
    // Go back to their pools after the lock is free.
    std::map<std::uint32_t, LentSurfaces> lent;
    std::unique_ptr<FrameLaneSender> lane;
    std::shared_ptr<FrameLaneReceiver> received;
    {
        const std::lock_guard lock(outMutex_);
        hasLane_ = false;
        lane.swap(out_.lane);
        received = lane_;
        unsent.swap(out_.queue);
        out_.awaited.clear();
        lent.swap(out_.lent);
    }
    if (received) received->stop();
    reportUnsent(reportsOf(std::move(unsent)));
    if (const Task release = release_.exchange(nullptr)) release();
}

bool SocketConnection::isPaused() const {
    const WaitingCost waiting = waitingCost();
    return waiting.messages >= kMostWaitingMessages || waiting.bytes >= kMostWaitingBytes ||
           waiting.descriptors >= kMostWaitingDescriptors;
}

/// Asks for what this connection can use now: input unless too much waits, output while something is unsent.
/// Output is nearly always possible, so it also stands for "at once": for the first look, which begins the
/// deadline of a peer that says nothing, and for what was received but held up.
void SocketConnection::arm() {
    const Socket held = socket();
    if (!held || token_ == 0) return;
    // Under the lock, so that the latest look at the queue is also the latest to be armed.
    const std::lock_guard lock(outMutex_);
    std::uint32_t events = isPaused() ? 0U : EPOLLIN;
    const bool isDueNow = !wasLookedAt_ || ((isHeldUp_ || cannotSend_) && !isPaused());
    if (isDueNow || (maySend() && !out_.queue.empty())) events |= EPOLLOUT;
    if (events != 0) loop_->arm(held->get(), token_, events);
}

void SocketConnection::didServe() {
    if ((isHeldUp_ || cannotSend_) && !isPaused()) arm();
}

/// On the loop's thread itself when the queue is idle, as long as another thread is left for the sockets.
bool SocketConnection::runSoon(Task& task) {
    if (!loop_->mayRunAfterwards()) return false;
    const bool isOurTurn = queue().tryTakeTurn();
    loop_->runAfterwards(isOurTurn ? Task([self = shared_from_this(), this, runs = std::move(task)] {
        queue().runInTurn(runs);
    })
                                   : nullptr);
    return isOurTurn;
}

void SocketConnection::ready(std::uint32_t) {
    const std::lock_guard lock(receiveMutex_);
    const Socket held = socket();
    if (!held) return;
    wasLookedAt_ = true;
    flush(held->get());
    isHeldUp_ = false;
    messagesThisTurn_ = 0;
    handleReceived();
    if (!isPaused() && !isOver()) receive(held->get());
    if (isOver()) return;
    noteDeadline();
    arm();
}

void SocketConnection::noteDeadline() {
    const bool isUnfinished = !isAuthenticated_ || (!incoming_.empty() && !isPaused());
    if (!isUnfinished) {
        deadline_.reset();
    } else if (!deadline_) {
        deadline_ = loop_->now() + kPatience;
        loop_->tickAt(*deadline_);
    }
}

std::optional<SocketWatcher::Moment> SocketConnection::tick(Moment now) {
    std::optional<Moment> next = returnSurfacesWhenDue(now);
    const auto noteNext = [&next](Moment moment) { next = next ? std::min(*next, moment) : moment; };
    if (const auto again = takeGivenBackWhenLent(now)) noteNext(*again);
    const std::lock_guard lock(receiveMutex_);
    if (deadline_ && *deadline_ <= now) {
        deadline_.reset();
        cutOff(isAuthenticated_ ? "message half sent and held" : "no end of authentication");
        return std::nullopt;
    }
    if (deadline_) noteNext(*deadline_);
    // One that waits in the lane may need any of them.
    if (!lane_ || !lane_->hasFront()) surfaces_.dropUnused(now);
    if (!surfaces_.empty()) noteNext(now + SurfaceCache::kPatience);
    return next;
}

/// Ends after some rounds, so that a peer that never stops sending does not keep the loop for itself.
void SocketConnection::receive(int socket) {
    constexpr int kMostRounds = 16;
    for (int round = 0; round < kMostRounds; ++round) {
        if (isPaused() || isHeldUp_ || isOver()) return;
        const Received received = receiveSome(socket);
        if (received == Received::nothing) {
            // All of what the peer sent has been taken; nothing can be told to it.
            if (cannotSend_) end(State::lost);
            return;
        }
        handleReceived();
        if (received == Received::all) return;
    }
}

/// Takes what is there, within the size of one message. Says `all` when nothing more was there, and `nothing`
/// when the connection ended.
SocketConnection::Received SocketConnection::receiveSome(int socket) {
    std::array<std::byte, 16384> buffer;
    alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(int) * kMostDescriptors)> control;
    iovec part{buffer.data(), buffer.size()};
    msghdr header{};
    header.msg_iov = &part;
    header.msg_iovlen = 1;
    header.msg_control = control.data();
    header.msg_controllen = control.size();
    const ssize_t count = ::recvmsg(socket, &header, MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
    if (count < 0 && (errno == EAGAIN || errno == EINTR)) return Received::nothing;
    if (count <= 0) return end(State::lost), Received::nothing;
    for (cmsghdr* item = CMSG_FIRSTHDR(&header); item != nullptr; item = CMSG_NXTHDR(&header, item)) {
        if (item->cmsg_level != SOL_SOCKET || item->cmsg_type != SCM_RIGHTS) continue;
        for (std::size_t place = CMSG_LEN(0); place + sizeof(int) <= item->cmsg_len; place += sizeof(int)) {
            int descriptor = -1;
            std::memcpy(&descriptor, reinterpret_cast<char*>(item) + place, sizeof(descriptor));
            receivedDescriptors_.emplace_back(descriptor);
        }
    }
    if ((header.msg_flags & MSG_CTRUNC) != 0 || receivedDescriptors_.size() > kMostDescriptors * 2)
        return cutOff("more descriptors than allowed"), Received::nothing;
    incoming_.insert(incoming_.end(), buffer.begin(), buffer.begin() + count);
    // Descriptors end a read early, perhaps with more behind them: the loop reports that when it is armed
    // again.
    return static_cast<std::size_t>(count) < buffer.size() ? Received::all : Received::some;
}

void SocketConnection::handleReceived() {
    if (isOver() || !authenticate()) return;
    do {
        // Told before anybody asks again: whoever serves the last message that waits looks at it.
        if (isPaused() || messagesThisTurn_ >= kMostMessagesATurn) {
            isHeldUp_ = true;
            return;
        }
        if (isOver() || !(handleNextOfLane() || handleNextMessage())) break;
        ++messagesThisTurn_;
    } while (true);
    if (incoming_.empty() && !receivedDescriptors_.empty() && !isOver())
        cutOff("descriptors that belong to no message");
}

bool SocketConnection::authenticate() {
    if (isAuthenticated_) return true;
    using Talk = dbus::ServerAuthentication::State;
    std::string answers;
    const Talk state =
        side_ == Side::server ? authentication_->take(incoming_, answers) : dbus::skipAnswers(incoming_);
    const Socket held = socket();
    // So short that it fits into the socket's buffer, or the peer is up to no good. One that is gone already
    // may have said before what it wants.
    if (!answers.empty() && held) {
        const ssize_t sent = ::send(held->get(), answers.data(), answers.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
        const bool isPart = sent >= 0 && sent < static_cast<ssize_t>(answers.size());
        if (isPart || (sent < 0 && errno == EAGAIN)) return cutOff("authentication that is not read"), false;
        if (sent < 0) cannotSend_ = true;
    }
    if (state == Talk::failed) return cutOff("authentication failed"), false;
    isAuthenticated_ = state == Talk::done;
    return isAuthenticated_;
}

/// Handles the message at the front of what was received. False when it is not there as a whole.
bool SocketConnection::handleNextMessage() {
    if (incoming_.size() < dbus::kFixedHeader) return false;
    const auto size = dbus::messageSize(incoming_);
    if (!size) return cutOff(size.error().localizedDescription()), false;
    if (incoming_.size() < *size) return false;
    std::uint32_t descriptorCount = 0;
    auto message = dbus::parse(std::span(incoming_).first(*size), descriptorCount);
    if (!message) return cutOff(message.error().localizedDescription()), false;
    if (descriptorCount > kMostDescriptors) return cutOff("more descriptors than allowed"), false;
    if (descriptorCount > receivedDescriptors_.size()) return cutOff("fewer descriptors than claimed"), false;
    const auto last = receivedDescriptors_.begin() + descriptorCount;
    message->descriptors.assign(std::make_move_iterator(receivedDescriptors_.begin()),
                                std::make_move_iterator(last));
    receivedDescriptors_.erase(receivedDescriptors_.begin(), last);
    lastReceived_ = message->serial;
    deadline_.reset();
    handle(*message);
    incoming_.erase(incoming_.begin(), incoming_.begin() + static_cast<std::ptrdiff_t>(*size));
    return true;
}

}  // namespace kelvo
