#include "base/KVLog.h"
#include "platform/IPCBounds.h"
#include "platform/linux/ipc/Introspection.h"
#include "platform/linux/ipc/SocketConnection.h"

#include <span>
#include <utility>

namespace kelvo {
namespace {

constexpr const char* kUnknownSurface = "com.quillon.kelvod.FrameLane.UnknownSurface";
constexpr const char* kFailed = "org.freedesktop.DBus.Error.Failed";

/// How long a frame may lie in the lane, given back, before the daemon looks without having one to send.
constexpr std::chrono::seconds kLookPatience{1};

/// Holds a lane's file until the message has gone that it goes with.
struct LaneFile : ObjectHandle {
    explicit LaneFile(FrameLane itsLane) : lane(std::move(itsLane)) {}
    const FrameLane lane;
};

/// Whether a method is one that hands over frames: a surface, and a record about it.
bool isFrame(const IPCMethod& description) {
    return description.isOneWay() && description.arguments.size() == 2 &&
           description.arguments[0].allowedObjects == IPCObjects::surfaces &&
           description.arguments[1].signature == "ay";
}

/// The serial that follows; 0 is none.
std::uint32_t after(std::uint32_t serial) {
    return serial + 1 == 0 ? 1 : serial + 1;
}

}  // namespace

// Server

void SocketConnection::answerWithLane(const dbus::Message& call) {
    if (!call.wantsReply()) return;
    if (side_ != Side::server || hasLane_) return answerError(call, kFailed, "no further lane");
    auto lane = FrameLane::create();
    if (!lane) return answerError(call, kFailed, lane.error().localizedDescription());
    dbus::Message reply = dbus::Message::replying(dbus::MessageType::reply, call.serial);
    reply.signature = "h";
    reply.body = Bytes(sizeof(std::uint32_t));  // the first descriptor
    reply.sentDescriptors.push_back({std::make_shared<LaneFile>(*lane), lane->descriptor()});
    std::unique_lock lock(outMutex_);
    if (isOver()) return;
    reply.serial = nextSerial();
    const bool isWithinBounds = push(reply);
    out_.lane = std::make_unique<FrameLaneSender>(std::move(*lane));
    hasLane_ = true;
    lock.unlock();
    afterPush(isWithinBounds);
}

/// False when it has to go as a message.
bool SocketConnection::sendByLane(const IPCMethod& description, std::size_t method, const Array& arguments) {
    if (!hasLane_ || !isFrame(description) || arguments.size() != 2) return false;
    auto surface = std::dynamic_pointer_cast<VideoSurface>(surfaceIn(description.arguments[0], arguments[0]));
    const Bytes* bytes = arguments[1].as<Bytes>();
    if (!surface || bytes == nullptr) return false;
    const Moment now = loop_->now();
    LentSurfaces givenBack;  // goes back after the lock is free
    std::unique_lock lock(outMutex_);
    if (!out_.lane || isOver() || cannotSend_ || !mayLend(givenBack)) return false;
    if (!out_.lane->takes(*surface, *bytes, now)) return false;
    out_.lane->put(nextSerial(), method, std::move(surface), *bytes, now);
    FrameLane lane = out_.lane->lane();  // it may end meanwhile
    lock.unlock();
    lane.ring();
    loop_->tickAt(now + kLookPatience);
    return true;
}

/// Whether the bound allows one message more with surfaces. Those that the lane has back go to `givenBack`.
bool SocketConnection::mayLend(LentSurfaces& givenBack) {
    std::size_t lent = out_.lent.size();
    if (out_.lane) {
        out_.lane->takeGivenBack(givenBack);
        lent += out_.lane->lentCount();
    }
    return lent < ipc_bounds::kMostLentMessages;
}

/// The surfaces of the message with this serial.
void SocketConnection::lend(std::uint32_t serial, LentSurfaces&& surfaces) {
    if (out_.lane) {
        for (const auto& each : surfaces) {
            if (const auto* surface = dynamic_cast<const VideoSurface*>(each.get()))
                out_.lane->sentInMessage(*surface, loop_->now());
        }
    }
    out_.lent.emplace(serial, std::move(surfaces));
}

/// When to look again.
std::optional<SocketWatcher::Moment> SocketConnection::takeGivenBackWhenLent(Moment now) {
    if (!hasLane_) return std::nullopt;
    LentSurfaces givenBack;  // goes back after the lock is free
    const std::lock_guard lock(outMutex_);
    if (!out_.lane) return std::nullopt;
    out_.lane->takeGivenBack(givenBack);
    return out_.lane->lentCount() == 0 ? std::nullopt : std::optional(now + kLookPatience);
}

// Client

/// Once, with the first frame: most clients are never sent any.
void SocketConnection::askForLane() {
    if (side_ != Side::client || std::exchange(hasAskedForLane_, true)) return;
    dbus::Message call;
    call.path = dbus::kObjectPath;
    call.interface = dbus::kLaneInterface;
    call.member = "Open";
    std::unique_lock lock(outMutex_);
    call.serial = nextSerial();
    out_.laneRequest = call.serial;
    const bool isWithinBounds = push(call);
    lock.unlock();
    afterPush(isWithinBounds);
}

/// A daemon that has no lanes answers with an error, and goes on with messages.
void SocketConnection::openLane(dbus::Message& reply) {
    if (reply.type == dbus::MessageType::error) return;
    if (reply.signature != "h" || reply.descriptors.size() != 1) return cutOff("reply of another signature");
    auto lane = FrameLane::fromDescriptor(reply.descriptors.front());
    if (!lane) return cutOff(lane.error().localizedDescription());
    const std::weak_ptr weakSelf = std::static_pointer_cast<SocketConnection>(shared_from_this());
    const auto receiver = std::make_shared<FrameLaneReceiver>(std::move(*lane), [weakSelf] {
        if (const auto self = weakSelf.lock()) self->laneRang();
    });
    {
        const std::lock_guard lock(outMutex_);
        if (isOver()) return;
        lane_ = receiver;
    }
    loop_->attend(receiver);
}

void SocketConnection::laneRang() {
    const std::lock_guard lock(receiveMutex_);
    if (!socket()) return;
    isHeldUp_ = false;
    messagesThisTurn_ = 0;
    handleReceived();
    if (isHeldUp_ && !isOver()) arm();
}

/// Handles the frame at the front of the lane, if what was sent before it has been handled. What was sent
/// after it waits for it.
bool SocketConnection::handleNextOfLane() {
    if (!lane_ || !lane_->hasFront()) return false;
    const FrameLane::Entry entry = lane_->front();
    const auto ahead = static_cast<std::int32_t>(entry.serial - after(lastReceived_));
    if (ahead > 0) return false;
    lastReceived_ = entry.serial;
    handleFrame(entry, lane_->takeFront());
    return true;
}

void SocketConnection::handleFrame(const FrameLane::Entry& entry, std::size_t place) {
    const auto interface = exportedInterface();
    if (!interface || entry.method >= interface->methods.size() ||
        !isFrame(interface->methods[entry.method]) || entry.size > entry.bytes.size())
        return cutOff("frame that is none");
    const VideoSurfaceRef surface = surfaces_.find(entry.surface, loop_->now());
    if (!surface) {
        dbus::Message error = dbus::Message::replying(dbus::MessageType::error, entry.serial);
        error.errorName = kUnknownSurface;
        return sendMessage(error);
    }
    const std::shared_ptr<ObjectHandle> lent = tiedTo(answerAtTheEnd(entry.serial, place), surface);
    const auto bytes = std::span(entry.bytes).first(entry.size);
    received(entry.method, {Array{lent}, Bytes(bytes.begin(), bytes.end())}, nullptr, {1, entry.size, 0});
}

}  // namespace kelvo
