#include "base/SpareTime.h"
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

bool SocketConnection::handOver(const IPCFrame& frame) {
    if (!hasLane_ || !frame.surface) return false;
    const Moment now = loop_->now();
    LentSurfaces givenBack;  // goes back after the lock is free
    std::unique_lock lock(outMutex_);
    if (!out_.lane || isOver() || cannotSend_ || !mayLend(givenBack)) return false;
    const std::uint32_t serial = dbus::serialAfter(out_.lastSerial);
    if (!out_.lane->put(serial, frame, now)) return false;
    out_.lastSerial = serial;
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
            if (const auto surface = VideoSurface::fromHandle(each))
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
    auto lane = FrameLane::fromDescriptor(std::move(reply.descriptors.front()));
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
    while (lane_->hasFront()) {
        if (serveNextOfLane()) continue;
        const std::lock_guard lock(receiveMutex_);
        if (!socket()) return;
        isHeldUp_ = false;
        messagesThisTurn_ = 0;
        handleReceived();
        if (isHeldUp_ && !isOver()) arm();
        return;
    }
}

/// Serves the frame at the front on this thread, if it is its turn. Then nothing need be put by for later,
/// which would take longer than all the rest.
bool SocketConnection::serveNextOfLane() {
    const SpareTime spare;  // what the frame leaves to be done is done when its turn is over
    std::unique_lock lock(receiveMutex_);
    // Under the lock, so that what was received before has been served.
    if (!socket() || !queue().tryTakeTurn()) return false;
    const std::optional<LaneFrame> frame = takeFrame();
    lock.unlock();
    queue().runInTurn([&] {
        if (frame) serve(frame->call());
    });
    return frame.has_value();
}

bool SocketConnection::handleNextOfLane() {
    if (!lane_) return false;
    const std::optional<LaneFrame> frame = takeFrame();
    if (!frame) return false;
    received(frame->call());
    return true;
}

/// Takes the frame at the front of the lane, if what was sent before it has been received. What was sent
/// after it waits for it.
std::optional<SocketConnection::LaneFrame> SocketConnection::takeFrame() {
    while (!isOver() && lane_->hasFront()) {
        LaneFrame frame{lane_->front(), nullptr};
        const auto ahead = static_cast<std::int32_t>(frame.entry.serial - dbus::serialAfter(lastReceived_));
        if (ahead > 0) break;
        lastReceived_ = frame.entry.serial;
        frame.surface = surfaceOf(frame.entry, lane_->takeFront());
        if (frame.surface) return frame;
    }
    return std::nullopt;
}

/// Gives a frame's place back when the last reference to its surface goes.
class SocketConnection::FrameLoan {
  public:
    FrameLoan(std::weak_ptr<SocketConnection> connection, std::uint32_t serial, std::size_t place,
              VideoSurfaceRef surface)
        : connection_(std::move(connection)), serial_(serial), place_(place), surface_(std::move(surface)) {}
    ~FrameLoan() {
        const auto connection = connection_.lock();
        if (connection && !connection->isOver()) connection->letGo(serial_, place_);
    }
    FrameLoan(const FrameLoan&) = delete;
    FrameLoan& operator=(const FrameLoan&) = delete;

  private:
    const std::weak_ptr<SocketConnection> connection_;
    const std::uint32_t serial_;
    const std::size_t place_;
    const VideoSurfaceRef surface_;
};

/// A frame's surface, lent to whoever uses it. None when it is not there any more, which the daemon is told,
/// or when it is no frame.
VideoSurfaceRef SocketConnection::surfaceOf(const FrameLane::Entry& entry, std::size_t place) {
    if (entry.size > entry.bytes.size()) {
        cutOff("frame that is none");
        return nullptr;
    }
    VideoSurfaceRef surface = surfaces_.find(entry.surface, loop_->now());
    if (!surface) {
        dbus::Message error = dbus::Message::replying(dbus::MessageType::error, entry.serial);
        error.errorName = kUnknownSurface;
        sendMessage(error);
        return nullptr;
    }
    holdSurfaces();
    VideoSurface* const pixels = surface.get();
    return {std::make_shared<FrameLoan>(std::static_pointer_cast<SocketConnection>(shared_from_this()),
                                        entry.serial, place, std::move(surface)),
            pixels};
}

}  // namespace kelvo
