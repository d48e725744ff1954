#include "base/KVLog.h"
#include "platform/IPCBounds.h"
#include "platform/linux/ipc/Introspection.h"
#include "platform/linux/ipc/SocketConnection.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <iterator>
#include <sys/socket.h>

namespace kelvo {
namespace {

using dbus::kObjectPath;

/// The objects above ours, and the one child of each.
constexpr std::array<std::pair<std::string_view, const char*>, 3> kParents{
    {{"/", "com"}, {"/com", "quillon"}, {"/com/quillon", "kelvod"}}};

constexpr const char* kUnknownMethod = "org.freedesktop.DBus.Error.UnknownMethod";
constexpr const char* kUnknownObject = "org.freedesktop.DBus.Error.UnknownObject";

std::string signatureOf(const std::vector<IPCArgument>& arguments) {
    std::string signature;
    for (const IPCArgument& argument : arguments)
        signature += argument.signature;
    return signature;
}

bool allowsObjects(const std::vector<IPCArgument>& arguments) {
    return std::ranges::any_of(
        arguments, [](const IPCArgument& argument) { return argument.allowedObjects != IPCObjects::none; });
}

/// As `writeBody`; what the peer would not take is not sent either, or it would cut this side off.
OptionalError writeWithinBounds(const Array& values, dbus::Message& message) {
    if (OptionalError error = dbus::writeBody(values, message)) return error;
    if (message.body.size() <= ipc_bounds::kLargestMessage - ipc_bounds::kLargestHeader) return std::nullopt;
    return KVError::posix(EMSGSIZE, "arguments of " + std::string(message.member));
}

KVError notConnected() {
    return KVError::posix(ENOTCONN, "connection");
}

}  // namespace

void SocketConnection::handle(dbus::Message& message) {
    switch (message.type) {
        case dbus::MessageType::call:
            return handleCall(message);
        case dbus::MessageType::reply:
        case dbus::MessageType::error:
            return handleReply(message);
        case dbus::MessageType::signal:
            return;  // allowed, and of no interest
    }
}

void SocketConnection::handleCall(dbus::Message& message) {
    const auto interface = exportedInterface();
    const bool isOurs = interface && message.path == kObjectPath &&
                        (message.interface.empty() || message.interface == interface->name);
    const auto method = isOurs ? interface->indexOf(message.member) : std::nullopt;
    if (!method) return handleStandardCall(message);
    handleExportedCall(message, *method, *interface);
}

void SocketConnection::handleExportedCall(dbus::Message& message, std::size_t method,
                                          const IPCInterface& interface) {
    const IPCMethod& description = interface.methods[method];
    if (message.signature != signatureOf(description.arguments))
        return cutOff("signature of " + description.name + " is not what it takes");
    // A one-way message has nothing to say, but a caller that waits for its end is let go: at once, or when
    // nobody uses the surfaces any more that came with it.
    const bool isAwaited = message.wantsReply() && description.isOneWay();
    const auto end = isAwaited ? answerAtTheEnd(message.serial) : nullptr;
    if (end && !message.descriptors.empty()) askForLane();
    auto arguments = readArguments(message, description, end);
    if (!arguments) return cutOff(description.name + ": " + arguments.error().localizedDescription());
    IPCReply reply;
    if (message.wantsReply() && !description.isOneWay()) reply = replyTo(message.serial, description);
    received(method, std::move(*arguments), std::move(reply),
             {1, message.body.size(), message.descriptors.size()});
}

/// Its surfaces hold `lease`, if there is one.
Result<Array> SocketConnection::readArguments(dbus::Message& message, const IPCMethod& description,
                                              const std::shared_ptr<void>& lease) {
    return dbus::readBody(message, allowsObjects(description.arguments),
                          [&](UniqueFd descriptor, const VideoSurface::Geometry& geometry) {
                              auto surface = openSurface(std::move(descriptor), geometry);
                              if (surface && lease) *surface = tiedTo(lease, *surface);
                              return surface;
                          });
}

IPCReply SocketConnection::replyTo(std::uint32_t serial, const IPCMethod& method) {
    return [weakSelf = std::weak_ptr(std::static_pointer_cast<SocketConnection>(shared_from_this())), serial,
            name = method.name, signature = signatureOf(*method.reply)](const Array& values) {
        const auto self = weakSelf.lock();
        if (!self || self->isOver()) return;
        dbus::Message reply = dbus::Message::replying(dbus::MessageType::reply, serial);
        reply.member = name;
        reply.signature = signature;
        if (const OptionalError error = writeWithinBounds(values, reply)) {
            KVLogError("IPC: reply of %s cannot be sent", name.c_str());
            reply = dbus::Message::replying(dbus::MessageType::error, serial);
            reply.errorName = "org.freedesktop.DBus.Error.Failed";
        }
        reply.member = {};
        self->sendMessage(reply);
    };
}

/// What every D-Bus object answers, and what tools ask before they call.
void SocketConnection::handleStandardCall(const dbus::Message& message) {
    const auto interface = exportedInterface();
    const std::string call = std::string(message.interface) + "." + std::string(message.member);
    if (call == "org.freedesktop.DBus.Hello") return answer(message, "s", {":1.1"});
    if (call == "org.freedesktop.DBus.Peer.Ping") return answer(message, "", {});
    if (call == "org.freedesktop.DBus.Properties.GetAll") return answer(message, "a{sv}", {Dictionary()});
    if (call == "org.freedesktop.DBus.Introspectable.Introspect") {
        if (message.path == kObjectPath && interface)
            return answer(message, "s", {dbus::objectXML(*interface)});
        for (const auto& [path, child] : kParents) {
            if (message.path == path) return answer(message, "s", {dbus::parentXML(child)});
        }
    }
    if (message.interface == dbus::kLaneInterface && message.member == "Open") return answerWithLane(message);
    if (message.path != kObjectPath)
        return answerError(message, kUnknownObject, "no object " + std::string(message.path));
    answerError(message, kUnknownMethod, "no method " + call);
}

void SocketConnection::answer(const dbus::Message& call, const std::string& signature, const Array& values) {
    if (!call.wantsReply()) return;
    dbus::Message reply = dbus::Message::replying(dbus::MessageType::reply, call.serial);
    reply.signature = signature;
    if (!dbus::writeBody(values, reply)) sendMessage(reply);
}

void SocketConnection::answerError(const dbus::Message& call, const char* name, const std::string& text) {
    if (!call.wantsReply()) return;
    dbus::Message reply = dbus::Message::replying(dbus::MessageType::error, call.serial);
    reply.errorName = name;
    reply.signature = "s";
    if (!dbus::writeBody({text}, reply)) sendMessage(reply);
}

void SocketConnection::handleReply(dbus::Message& message) {
    const auto interface = remoteInterface();
    std::pair<ReplyIdentifier, std::size_t> awaited{0, 0};
    // Go back after the lock is free.
    std::map<std::uint32_t, LentSurfaces>::node_type returned;
    LentSurfaces givenBack;
    bool isLane = false;
    {
        const std::lock_guard lock(outMutex_);
        returned = out_.lent.extract(message.replySerial);
        if (out_.lane) {
            out_.lane->takeGivenBack(message.replySerial, givenBack);
            if (message.type == dbus::MessageType::error && !givenBack.empty()) out_.lane->forgetSurfaces();
        }
        isLane = out_.laneRequest != 0 && message.replySerial == out_.laneRequest;
        if (isLane) out_.laneRequest = 0;
        const auto found = out_.awaited.extract(message.replySerial);
        if (found) awaited = found.mapped();
    }
    if (isLane) return openLane(message);
    if (awaited.first == 0 || !interface) return;
    if (message.type == dbus::MessageType::error)
        return receivedError(awaited.first, KVError::posix(EPROTO, std::string(message.errorName)));
    const std::vector<IPCArgument>& expected = *interface->methods[awaited.second].reply;
    if (message.signature != signatureOf(expected)) return cutOff("reply of another signature");
    auto values = dbus::readBody(message, allowsObjects(expected));
    if (!values) return cutOff("reply: " + values.error().localizedDescription());
    receivedReply(awaited.first, std::move(*values));
}

OptionalError SocketConnection::transmit(const IPCInterface& interface, std::size_t method,
                                         const Array& arguments, ReplyIdentifier identifier,
                                         const ErrorReport& whenUnsent) {
    const IPCMethod& description = interface.methods[method];
    LentSurfaces lent =
        description.isOneWay() ? surfacesIn(description.arguments, arguments) : LentSurfaces();
    dbus::Message call;
    call.flags = identifier == 0 && lent.empty() ? dbus::Message::kNoReplyExpected : 0;
    call.path = kObjectPath;
    call.interface = interface.name;
    call.member = description.name;
    const std::string signature = signatureOf(description.arguments);
    call.signature = signature;
    if (OptionalError error = writeWithinBounds(arguments, call)) return error;
    return sendCall(call, identifier, method, std::move(lent), whenUnsent);
}

OptionalError SocketConnection::sendCall(dbus::Message& message, ReplyIdentifier identifier,
                                         std::size_t method, LentSurfaces surfaces, ErrorReport whenUnsent) {
    LentSurfaces givenBack;  // goes back after the lock is free
    std::unique_lock lock(outMutex_);
    // Looked at under the lock: what is queued or lent afterwards would not be found by `close`.
    if (isOver() || cannotSend_) return notConnected();
    if (!surfaces.empty() && !mayLend(givenBack)) return KVError::posix(EAGAIN, "surface");
    message.serial = nextSerial();
    if (!surfaces.empty()) lend(message.serial, std::move(surfaces));
    if (identifier != 0) out_.awaited[message.serial] = {identifier, method};
    const bool isWithinBounds = push(message, identifier == 0 ? std::move(whenUnsent) : nullptr);
    lock.unlock();
    afterPush(isWithinBounds);
    // What was queued without wanting a reply is reported from the queue, should it stay there.
    const bool isReportedHere = identifier != 0 ? isOver() || cannotSend_ : !isWithinBounds;
    return isReportedHere ? OptionalError(notConnected()) : std::nullopt;
}

void SocketConnection::sendMessage(dbus::Message& message) {
    std::unique_lock lock(outMutex_);
    message.serial = nextSerial();
    const bool isWithinBounds = push(message);
    lock.unlock();
    afterPush(isWithinBounds);
}

std::uint32_t SocketConnection::nextSerial() {
    return out_.lastSerial = dbus::serialAfter(out_.lastSerial);
}

/// Queues a message. False when that passes a bound; then nothing was queued.
bool SocketConnection::push(dbus::Message& message, ErrorReport whenUnsent) {
    return push({dbus::serialize(message), 0, std::move(message.sentDescriptors), std::move(whenUnsent)});
}

bool SocketConnection::push(Outgoing&& outgoing) {
    if (out_.unsentBytes + outgoing.bytes.size() > ipc_bounds::kMostUnsentBytes ||
        out_.unsentDescriptors + outgoing.descriptors.size() > ipc_bounds::kMostUnsentDescriptors)
        return false;
    out_.unsentBytes += outgoing.bytes.size();
    out_.unsentDescriptors += outgoing.descriptors.size();
    out_.queue.push_back(std::move(outgoing));
    return true;
}

std::vector<SocketConnection::ErrorReport> SocketConnection::reportsOf(std::deque<Outgoing> unsent) {
    std::vector<ErrorReport> reports;
    for (Outgoing& each : unsent) {
        if (each.whenUnsent) reports.push_back(std::move(each.whenUnsent));
    }
    return reports;
}

/// Sends on the caller's thread what the socket takes at once; the loop sees to the rest.
void SocketConnection::afterPush(bool isWithinBounds) {
    if (!isWithinBounds) return cutOff("does not read what is sent to it");
    const Socket held = socket();
    if (!held) return;
    if (flush(held->get()) == Flushed::some || cannotSend_) arm();
}

SocketConnection::Flushed SocketConnection::flush(int socket) {
    // They may be somebody else's surfaces, whose last reference tells another connection that they are free.
    SentDescriptors goneAfterTheLock;
    const std::lock_guard lock(outMutex_);
    return flushUnderLock(socket, goneAfterTheLock);
}

void SocketConnection::dropUnsent(SentDescriptors& gone) {
    for (Outgoing& each : out_.queue)
        std::ranges::move(each.descriptors, std::back_inserter(gone));
    reportUnsent(reportsOf(std::exchange(out_.queue, {})));
}

SocketConnection::Flushed SocketConnection::flushUnderLock(int socket, SentDescriptors& gone) {
    if (!maySend()) return Flushed::some;
    if (cannotSend_) dropUnsent(gone);
    while (!out_.queue.empty()) {
        Outgoing& next = out_.queue.front();
        alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(int) * ipc_bounds::kMostDescriptors)> control{};
        iovec part{next.bytes.data() + next.sent, next.bytes.size() - next.sent};
        msghdr header{};
        header.msg_iov = &part;
        header.msg_iovlen = 1;
        if (!next.descriptors.empty()) {
            header.msg_control = control.data();
            header.msg_controllen = CMSG_SPACE(sizeof(int) * next.descriptors.size());
            cmsghdr* item = CMSG_FIRSTHDR(&header);
            item->cmsg_level = SOL_SOCKET;
            item->cmsg_type = SCM_RIGHTS;
            item->cmsg_len = CMSG_LEN(sizeof(int) * next.descriptors.size());
            for (std::size_t i = 0; i < next.descriptors.size(); ++i) {
                const int descriptor = next.descriptors[i].descriptor;
                std::memcpy(CMSG_DATA(item) + i * sizeof(int), &descriptor, sizeof(descriptor));
            }
        }
        const ssize_t count = ::sendmsg(socket, &header, MSG_NOSIGNAL | MSG_DONTWAIT);
        if (count < 0 && errno == EINTR) continue;
        if (count < 0 && errno == EAGAIN) return Flushed::some;
        if (count < 0) {
            cannotSend_ = true;
            dropUnsent(gone);
            break;
        }
        out_.unsentDescriptors -= next.descriptors.size();
        std::ranges::move(next.descriptors, std::back_inserter(gone));
        next.descriptors.clear();
        next.sent += static_cast<std::size_t>(count);
        out_.unsentBytes -= static_cast<std::size_t>(count);
        if (next.sent == next.bytes.size()) out_.queue.pop_front();
    }
    return Flushed::all;
}

}  // namespace kelvo
