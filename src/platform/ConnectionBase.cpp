#include "platform/ConnectionBase.h"

#include "base/KVLog.h"
#include "platform/IPCBounds.h"

#include <cerrno>
#include <utility>

namespace kelvo {
namespace {

/// Whoever serves it holds it.
thread_local ConnectionBase* connectionServed = nullptr;

/// Names the connection that is served for as long as this object lives.
class Serving {
  public:
    explicit Serving(ConnectionBase& connection) { connectionServed = &connection; }
    ~Serving() { connectionServed = nullptr; }
    Serving(const Serving&) = delete;
    Serving& operator=(const Serving&) = delete;
};

/// Counts a reply as owed for as long as somebody may still send it.
class OwedReply {
  public:
    explicit OwedReply(std::shared_ptr<std::atomic<std::size_t>> owed) : owed_(std::move(owed)) { ++*owed_; }
    ~OwedReply() { settle(); }
    OwedReply(const OwedReply&) = delete;
    OwedReply& operator=(const OwedReply&) = delete;

    /// True the first time.
    bool settle() {
        if (isSettled_.exchange(true)) return false;
        --*owed_;
        return true;
    }

  private:
    const std::shared_ptr<std::atomic<std::size_t>> owed_;
    std::atomic<bool> isSettled_{false};
};

KVError connectionOver() {
    return KVError::posix(ENOTCONN, "connection");
}

}  // namespace

/// Holds its connection: whoever may still send keeps it alive.
class ConnectionBase::Remote : public IPCRemoteObject {
  public:
    Remote(std::shared_ptr<ConnectionBase> connection, std::function<void(const KVError&)> errorHandler)
        : connection_(std::move(connection)), errorHandler_(std::move(errorHandler)) {}

    void send(std::size_t method, Array arguments, IPCReply replyHandler) override {
        connection_->send(method, arguments, std::move(replyHandler), errorHandler_);
    }

  private:
    const std::shared_ptr<ConnectionBase> connection_;
    const std::function<void(const KVError&)> errorHandler_;
};

IPCConnectionRef ConnectionBase::current() {
    return connectionServed != nullptr ? connectionServed->shared_from_this() : nullptr;
}

void ConnectionBase::setExported(std::shared_ptr<const IPCInterface> interface,
                                 std::shared_ptr<IPCExportedObject> object) {
    exported_.set(std::make_shared<const Exported>(Exported{std::move(interface), std::move(object)}));
}

void ConnectionBase::setRemoteInterface(std::shared_ptr<const IPCInterface> interface) {
    remoteInterface_.set(std::move(interface));
}

std::shared_ptr<const IPCInterface> ConnectionBase::exportedInterface() const {
    return exported_.with([](const auto& exported) { return exported ? exported->interface : nullptr; });
}

void ConnectionBase::setInterruptionHandler(std::function<void()> handler) {
    handlers_.with([&](Handlers& handlers) { handlers.interruption.swap(handler); });
}

void ConnectionBase::setInvalidationHandler(std::function<void()> handler) {
    handlers_.with([&](Handlers& handlers) { handlers.invalidation.swap(handler); });
}

std::shared_ptr<IPCRemoteObject> ConnectionBase::remoteObjectProxyWithErrorHandler(
    std::function<void(const KVError&)> errorHandler) {
    return std::make_shared<Remote>(shared_from_this(), std::move(errorHandler));
}

void ConnectionBase::resume() {
    openGate();
    didResume();
}

void ConnectionBase::openGate() {
    // Under the lock, so that nothing overtakes what was held back.
    gate_.with([this](Gate& gate) {
        gate.isOpen = true;
        for (Task& task : std::exchange(gate.held, {}))
            queue_.async(std::move(task));
        if (std::exchange(gate.wasLostBefore, false))
            queue_.async([self = shared_from_this()] { self->runHandlers(State::lost); });
    });
}

/// A peer that is lost before this side is set up is reported once it is.
void ConnectionBase::queueHandlers(State state) {
    gate_.with([&](Gate& gate) {
        if (state == State::lost && !gate.isOpen) {
            gate.wasLostBefore = true;
        } else {
            gate.held.push_back([self = shared_from_this(), state] { self->runHandlers(state); });
        }
    });
    if (state == State::over || gate_.with([](const Gate& gate) { return gate.isOpen; })) openGate();
}

void ConnectionBase::enqueue(Task task) {
    gate_.with([&](Gate& gate) {
        if (gate.isOpen) {
            if (!runSoon(task)) queue_.async(std::move(task));
        } else {
            gate.held.push_back(std::move(task));
        }
    });
}

/// What a lost peer sent before it went still counts; after an invalidation nothing is served.
template <typename Serve>
void ConnectionBase::serveWith(const Serve& serve) {
    if (state_ == State::over) return;
    const auto exported = exported_.copy();
    if (!exported || !exported->object) return;
    const Serving serving(*this);
    serve(*exported);
}

/// Runs with the connection held.
template <typename Work>
void ConnectionBase::enqueueServed(WaitingCost cost, Work work) {
    waitingMessages_ += cost.messages;
    waitingBytes_ += cost.bytes;
    waitingDescriptors_ += cost.descriptors;
    enqueue([self = shared_from_this(), work = std::move(work), cost]() mutable {
        work();
        self->waitingMessages_ -= cost.messages;
        self->waitingBytes_ -= cost.bytes;
        self->waitingDescriptors_ -= cost.descriptors;
        self->didServe();
    });
}

void ConnectionBase::received(std::size_t method, Array arguments, IPCReply reply, WaitingCost cost) {
    if (reply && *owedReplies_ >= ipc_bounds::kMostOwedReplies)
        return cutOff("more requests than may be outstanding");
    enqueueServed(cost, [this, method, arguments = std::move(arguments),
                         reply = owed(std::move(reply))]() mutable {
        serveWith([&](const Exported& exported) {
            if (exported.object->serve(method, std::exchange(arguments, {}), std::exchange(reply, nullptr)))
                return;
            cutOff("arguments of " + exported.interface->methods[method].name + " are not what it takes");
        });
    });
}

void ConnectionBase::received(const IPCFrame& frame) {
    enqueueServed({1, 0, 0}, [this, method = frame.method, surface = frame.surface,
                              record = Bytes(frame.record.begin(), frame.record.end())]() mutable {
        const VideoSurfaceRef held = std::exchange(surface, nullptr);
        serve({method, held, record});
    });
}

IPCReply ConnectionBase::owed(IPCReply reply) const {
    if (!reply) return nullptr;
    return [reply = std::move(reply), owed = std::make_shared<OwedReply>(owedReplies_)](Array values) {
        if (owed->settle()) reply(std::move(values));
    };
}

void ConnectionBase::serve(const IPCFrame& frame) {
    serveWith([&](const Exported& exported) {
        const bool isMethod = frame.method < exported.interface->methods.size();
        if (!isMethod || !exported.object->serveFrame(frame)) cutOff("frame that is none");
    });
}

void ConnectionBase::receivedReply(ReplyIdentifier identifier, Array values) {
    enqueue([self = shared_from_this(), identifier, values = std::move(values)]() mutable {
        if (const AwaitedReply awaited = self->takeAwaited(identifier); awaited.handler)
            awaited.handler(std::move(values));
    });
}

void ConnectionBase::receivedError(ReplyIdentifier identifier, const KVError& error) {
    enqueue([self = shared_from_this(), identifier, error] {
        if (const AwaitedReply awaited = self->takeAwaited(identifier); awaited.errorHandler)
            awaited.errorHandler(error);
    });
}

ConnectionBase::AwaitedReply ConnectionBase::takeAwaited(ReplyIdentifier identifier) {
    return awaitedReplies_.with([&](auto& replies) {
        const auto found = replies.extract(identifier);
        return found ? std::move(found.mapped()) : AwaitedReply();
    });
}

void ConnectionBase::send(std::size_t method, const Array& arguments, IPCReply replyHandler,
                          const ErrorReport& errorHandler) {
    const OptionalError error = trySend(method, arguments, {std::move(replyHandler), errorHandler});
    if (error && errorHandler) errorHandler(*error);
}

OptionalError ConnectionBase::trySend(std::size_t method, const Array& arguments, AwaitedReply awaited) {
    const auto interface = remoteInterface_.copy();
    if (!interface || method >= interface->methods.size()) return KVError::posix(EINVAL, "remote interface");
    const IPCMethod& description = interface->methods[method];
    ReplyIdentifier identifier = 0;
    if (!description.isOneWay() && awaited.handler) {
        do {
            identifier = ++lastIdentifier_;
        } while (identifier == 0);
        awaitedReplies_.with([&](auto& replies) { replies.emplace(identifier, std::exchange(awaited, {})); });
    }
    OptionalError error = isOver()
                              ? connectionOver()
                              : transmit(*interface, method, arguments, identifier, awaited.errorHandler);
    if (identifier == 0) return error;
    if (!error && !isOver()) return std::nullopt;
    // The connection may have ended meanwhile and reported this reply: whoever takes it reports.
    if (!takeAwaited(identifier).handler) return std::nullopt;
    return error ? error : connectionOver();
}

void ConnectionBase::reportUnsent(std::vector<ErrorReport> reports) {
    if (reports.empty()) return;
    queue_.async([self = shared_from_this(), reports = std::move(reports)] {
        for (const ErrorReport& report : reports)
            report(connectionOver());
    });
}

void ConnectionBase::cutOff(const std::string& reason) {
    if (isOver()) return;
    KVLogError("IPC: cut off PID %d: %s", processIdentifier(), reason.c_str());
    end(State::over);
}

void ConnectionBase::end(State state) {
    State expected = State::open;
    if (!state_.compare_exchange_strong(expected, state)) return;
    const auto self = shared_from_this();
    queueHandlers(state);
    close();
}

void ConnectionBase::runHandlers(State state) {
    const Handlers handlers = handlers_.exchange({});
    if (state == State::lost && handlers.interruption) handlers.interruption();
    state_ = State::over;
    if (handlers.invalidation) handlers.invalidation();
    exported_.set(nullptr);
    for (const auto& [identifier, awaited] : awaitedReplies_.exchange({})) {
        if (awaited.errorHandler) awaited.errorHandler(connectionOver());
    }
    didEnd();
    // Somebody may hold the connection for long.
    queue_.retire();
}

}  // namespace kelvo
