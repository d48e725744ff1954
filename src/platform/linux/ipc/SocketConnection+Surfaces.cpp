#include "platform/linux/ipc/SocketConnection.h"

#include <utility>

namespace kelvo {

Result<VideoSurfaceRef> SocketConnection::openSurface(UniqueFd descriptor,
                                                      const VideoSurface::Geometry& geometry) {
    // Only a client is sent one frame after the other.
    if (side_ == Side::server) return VideoSurface::fromDescriptor(std::move(descriptor), geometry);
    const Moment now = loop_->now();
    auto surface = surfaces_.open(std::move(descriptor), geometry, now);
    if (surface) loop_->tickAt(now + SurfaceCache::kPatience);
    return surface;
}

/// Answers, with nothing, when its last reference goes.
std::shared_ptr<void> SocketConnection::answerAtTheEnd(std::uint32_t serial) {
    if (side_ == Side::client) holdSurfaces();
    const std::weak_ptr weakSelf = std::static_pointer_cast<SocketConnection>(shared_from_this());
    // What it points to is of no interest, as long as it is something.
    return {this, [weakSelf, serial](void*) {
                const auto self = weakSelf.lock();
                if (self && !self->isOver()) self->letGo(serial);
            }};
}

/// Of one message more.
void SocketConnection::holdSurfaces() {
    std::unique_lock lock(outMutex_);
    if (out_.returns.hold()) sendReturns(std::move(lock));
}

/// Only a client is sent one frame after the other; a server's peer may wait for this very answer. What came
/// to its `place` of the lane is left there, unless the peer may need it before it sends the next.
void SocketConnection::letGo(std::uint32_t serial, std::optional<std::size_t> place) {
    if (side_ == Side::server) {
        dbus::Message reply = dbus::Message::replying(dbus::MessageType::reply, serial);
        return sendMessage(reply);
    }
    std::unique_lock lock(outMutex_);
    if (place && out_.returns.isQuiet() && !lane_->hasFront()) {
        out_.returns.letGoQuietly();
        return lane_->giveBack(*place, serial);
    }
    const Moment now = loop_->now();
    if (!out_.returns.letGo(serial, now)) {
        lock.unlock();
        return loop_->tickAt(now + SurfaceReturns::kPatience);
    }
    sendReturns(std::move(lock));
}

void SocketConnection::sendReturns(std::unique_lock<std::mutex> outLock) {
    const bool isWithinBounds = pushReturns();
    outLock.unlock();
    afterPush(isWithinBounds);
}

/// All in one piece, so that the peer wakes up once.
bool SocketConnection::pushReturns() {
    Bytes bytes;
    for (const std::uint32_t each : out_.returns.take()) {
        dbus::Message reply = dbus::Message::replying(dbus::MessageType::reply, each);
        reply.serial = nextSerial();
        const Bytes one = dbus::serialize(reply);
        bytes.insert(bytes.end(), one.begin(), one.end());
    }
    return push({std::move(bytes), 0, {}, nullptr});
}

/// When the next surfaces are due, if any wait.
std::optional<SocketWatcher::Moment> SocketConnection::returnSurfacesWhenDue(Moment now) {
    std::unique_lock lock(outMutex_);
    const auto due = out_.returns.due();
    if (!due || *due > now) return due;
    sendReturns(std::move(lock));
    return std::nullopt;
}

}  // namespace kelvo
