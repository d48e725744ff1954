#pragma once

#include "base/Guarded.h"
#include "base/SerialQueue.h"
#include "platform/IPC.h"

#include <atomic>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

namespace kelvo {

/// What the connections of every transport have in common: the queue, the handlers, the order of a
/// connection's end and the replies that are waited for. A transport derives from it, hands in what arrives
/// and carries what is sent. Thread-safe.
class ConnectionBase : public IPCConnection, public std::enable_shared_from_this<ConnectionBase> {
  public:
    void setExported(std::shared_ptr<const IPCInterface> interface,
                     std::shared_ptr<IPCExportedObject> object) override;
    void setRemoteInterface(std::shared_ptr<const IPCInterface> interface) override;
    void setInterruptionHandler(std::function<void()> handler) override;
    void setInvalidationHandler(std::function<void()> handler) override;
    void resume() override;
    void invalidate() override { end(State::over); }
    /// Never, unless a transport has a shorter way for frames.
    bool handOver(const IPCFrame&) override { return false; }
    std::shared_ptr<IPCRemoteObject> remoteObjectProxyWithErrorHandler(
        std::function<void(const KVError&)> errorHandler) override;

    /// The connection whose message the calling thread serves; none outside of that.
    static IPCConnectionRef current();

    bool isOver() const { return state_ != State::open; }
    /// What messages cost that arrived and are not served yet.
    struct WaitingCost {
        std::size_t messages = 0;
        std::size_t bytes = 0;
        std::size_t descriptors = 0;
    };
    WaitingCost waitingCost() const { return {waitingMessages_, waitingBytes_, waitingDescriptors_}; }

    /// Ends the connection because of what the peer did, and logs why in one line.
    void cutOff(const std::string& reason);

  protected:
    enum class State : std::uint8_t { open, lost, over };
    using ReplyIdentifier = std::uint32_t;
    using ErrorReport = std::function<void(const KVError&)>;

    explicit ConnectionBase(const char* queueLabel) : queue_(queueLabel) {}

    /// From the transport: a message of the exported interface arrived. `reply` as `IPCExportedObject` says,
    /// but that it may be called more than once and after the end: that is seen to here. A peer that waits
    /// for too many replies is cut off instead.
    void received(std::size_t method, Array arguments, IPCReply reply, WaitingCost cost = {1, 0, 0});
    /// The same for a frame.
    void received(const IPCFrame& frame);
    /// Serves such a frame then and there. Only in a turn of the connection's queue.
    void serve(const IPCFrame& frame);
    /// The reply arrived to what was sent with this identifier; an unknown one is ignored.
    void receivedReply(ReplyIdentifier identifier, Array values);
    /// The peer could not serve it.
    void receivedError(ReplyIdentifier identifier, const KVError& error);
    /// Ends the connection, once: closes it and queues the handlers.
    void end(State state);

    std::shared_ptr<const IPCInterface> exportedInterface() const;
    std::shared_ptr<const IPCInterface> remoteInterface() const { return remoteInterface_.copy(); }

    /// To the transport: send method number `method` of `interface`. A reply is wanted under `identifier`
    /// unless it is 0. An error means that nothing was sent. What is only queued by then, wants no reply and
    /// is still there at the connection's end goes to `reportUnsent`.
    virtual OptionalError transmit(const IPCInterface& interface, std::size_t method, const Array& arguments,
                                   ReplyIdentifier identifier, const ErrorReport& whenUnsent) = 0;
    /// Runs what messages left behind that were taken and never sent, on the connection's queue.
    void reportUnsent(std::vector<ErrorReport> reports);
    /// Starts receiving; called once.
    virtual void didResume() {}
    /// A message was served: `waitingCost` fell.
    virtual void didServe() {}
    /// Runs a task of the connection's queue before this thread does anything else of its own, if the queue
    /// is idle and the transport can spare the thread. False when not: then the task is left.
    virtual bool runSoon(Task&) { return false; }
    /// The connection has ended: release what it holds of the system. Called once, on any thread.
    virtual void close() = 0;
    /// Nothing runs for the peer any more. Called once, on the connection's queue.
    virtual void didEnd() {}

    /// What runs on the connection's queue. Held back until the connection is resumed.
    void enqueue(Task task);
    SerialQueue& queue() { return queue_; }

  private:
    class Remote;
    struct Exported {
        std::shared_ptr<const IPCInterface> interface;
        std::shared_ptr<IPCExportedObject> object;
    };
    struct Handlers {
        std::function<void()> interruption;
        std::function<void()> invalidation;
    };
    struct AwaitedReply {
        IPCReply handler;
        ErrorReport errorHandler;
    };
    struct Gate {
        bool isOpen = false;
        bool wasLostBefore = false;  // its handlers, which are yet to be set, wait for the opening
        std::vector<Task> held;
    };

    template <typename Serve>
    void serveWith(const Serve& serve);
    template <typename Work>
    void enqueueServed(WaitingCost cost, Work work);
    void send(std::size_t method, const Array& arguments, IPCReply replyHandler,
              const ErrorReport& errorHandler);
    OptionalError trySend(std::size_t method, const Array& arguments, AwaitedReply awaited);
    AwaitedReply takeAwaited(ReplyIdentifier identifier);
    IPCReply owed(IPCReply reply) const;
    void openGate();
    void queueHandlers(State state);
    void runHandlers(State state);

    SerialQueue queue_;
    std::atomic<State> state_{State::open};
    std::atomic<std::size_t> waitingMessages_{0};
    std::atomic<std::size_t> waitingBytes_{0};
    std::atomic<std::size_t> waitingDescriptors_{0};
    const std::shared_ptr<std::atomic<std::size_t>> owedReplies_ =
        std::make_shared<std::atomic<std::size_t>>(0);
    std::atomic<ReplyIdentifier> lastIdentifier_{0};
    Guarded<std::shared_ptr<const Exported>> exported_;
    Guarded<std::shared_ptr<const IPCInterface>> remoteInterface_;
    Guarded<Handlers> handlers_;
    Guarded<std::map<ReplyIdentifier, AwaitedReply>> awaitedReplies_;
    Guarded<Gate> gate_;
};

}  // namespace kelvo
