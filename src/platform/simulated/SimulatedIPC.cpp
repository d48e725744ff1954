#include "platform/simulated/SimulatedIPC.h"

#include <algorithm>
#include <cerrno>
#include <iterator>

namespace kelvo {
namespace {

/// The process identifier that clients see of the one process there is.
constexpr std::int32_t kOwnProcessIdentifier = 100;

}  // namespace

void SimulatedConnection::join(const SimulatedConnectionRef& one, const SimulatedConnectionRef& other) {
    one->peer_.set(other);
    other->peer_.set(one);
}

void SimulatedConnection::sendRaw(std::size_t method, const Array& arguments) {
    if (const auto receiver = peer()) receiver->deliver(method, arguments, 0);
}

std::uint64_t SimulatedConnection::drain() {
    queue().sync([] {});
    return activity_;
}

OptionalError SimulatedConnection::transmit(const IPCInterface&, std::size_t method, const Array& arguments,
                                            ReplyIdentifier identifier, const ErrorReport&) {
    const auto receiver = peer();
    if (!receiver || receiver->isOver()) return KVError::posix(ENOTCONN, "connection");
    receiver->deliver(method, arguments, identifier);
    return std::nullopt;
}

void SimulatedConnection::deliver(std::size_t method, const Array& arguments, ReplyIdentifier identifier) {
    note();
    IPCReply reply;
    if (identifier != 0) {
        reply = [sender = peer_.copy(), identifier](Array values) {
            const auto receiver = sender.lock();
            if (!receiver) return;
            receiver->note();
            receiver->receivedReply(identifier, std::move(values));
        };
    }
    received(method, arguments, std::move(reply));
}

void SimulatedConnection::close() {
    note();
    const auto other = peer();
    if (other && !other->isOver()) other->end(State::lost);
}

void SimulatedIPC::setIdentity(std::int32_t processIdentifier, Dictionary entitlements) {
    identity_.set({processIdentifier, std::move(entitlements)});
}

std::shared_ptr<IPCListener> SimulatedIPC::createListener(std::string_view serviceName) {
    auto listener = std::make_shared<SimulatedListener>(std::string(serviceName));
    listeners_.with([&](auto& all) { all.push_back(listener); });
    return listener;
}

Result<std::shared_ptr<IPCListener>> SimulatedIPC::createAnonymousListener() {
    auto listener = std::make_shared<SimulatedListener>("");
    listener->setEndpoint(std::make_shared<SimulatedEndpoint>(listener));
    return std::shared_ptr<IPCListener>(std::move(listener));
}

std::shared_ptr<SimulatedListener> SimulatedIPC::listenerNamed(std::string_view serviceName) const {
    const auto all = listeners();
    const auto found = std::ranges::find(all, serviceName, &SimulatedListener::serviceName);
    return found == all.end() ? nullptr : *found;
}

std::vector<std::shared_ptr<SimulatedListener>> SimulatedIPC::listeners() const {
    std::vector<std::shared_ptr<SimulatedListener>> living;
    for (const auto& each : listeners_.copy()) {
        if (auto listener = each.lock()) living.push_back(std::move(listener));
    }
    return living;
}

Result<IPCConnectionRef> SimulatedIPC::connectToService(std::string_view serviceName) {
    return connectTo(listenerNamed(serviceName));
}

Result<IPCConnectionRef> SimulatedIPC::connectToEndpoint(const std::shared_ptr<IPCEndpoint>& endpoint) {
    const auto simulated = std::dynamic_pointer_cast<SimulatedEndpoint>(endpoint);
    return connectTo(simulated ? simulated->listener() : nullptr);
}

Result<IPCConnectionRef> SimulatedIPC::connectTo(const std::shared_ptr<SimulatedListener>& listener) {
    if (!listener || listener->resumeCount() == 0) return KVError::posix(ECONNREFUSED, "connection");
    const Identity identity = identity_.copy();
    const auto accepted =
        std::make_shared<SimulatedConnection>(identity.processIdentifier, identity.entitlements);
    const auto connected = std::make_shared<SimulatedConnection>(kOwnProcessIdentifier, Dictionary());
    SimulatedConnection::join(accepted, connected);
    connections_.with([&](auto& all) { all.insert(all.end(), {accepted, connected}); });
    const auto delegate = listener->delegate();
    if (!delegate || !delegate->listenerShouldAcceptNewConnection(*listener, accepted))
        accepted->invalidate();
    return IPCConnectionRef(connected);
}

IPCConnectionRef SimulatedIPC::currentConnection() {
    if (auto serving = ConnectionBase::current()) return serving;
    return current_.copy();
}

std::uint64_t SimulatedIPC::drainAll() {
    std::uint64_t activity = activityOfThoseGone_;
    for (const SimulatedConnectionRef& connection : connections_.copy())
        activity += connection->drain();
    return activity;
}

bool SimulatedIPC::settle() {
    const std::uint64_t before = settledActivity_;
    for (std::uint64_t activity = drainAll(); activity != settledActivity_; activity = drainAll())
        settledActivity_ = activity;
    letGoOfWhatIsOver();
    return settledActivity_ != before;
}

/// Those that somebody else holds may have something to do yet, which is to be waited for.
void SimulatedIPC::letGoOfWhatIsOver() {
    std::vector<SimulatedConnectionRef> gone;  // destroyed after the lock is free
    connections_.with([&](auto& all) {
        const auto isNeeded = [](const auto& each) { return !each->isOver() || each.use_count() > 1; };
        const auto firstGone = std::stable_partition(all.begin(), all.end(), isNeeded);
        gone.assign(std::make_move_iterator(firstGone), std::make_move_iterator(all.end()));
        all.erase(firstGone, all.end());
    });
    for (const SimulatedConnectionRef& connection : gone)
        activityOfThoseGone_ += connection->drain();
}

}  // namespace kelvo
