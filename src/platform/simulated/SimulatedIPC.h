#pragma once

#include "base/Guarded.h"
#include "platform/ConnectionBase.h"

#include <atomic>
#include <map>
#include <string>
#include <vector>

namespace kelvo {

/// One end of a connection inside this process, with the identity and the rights that a test gives its peer.
/// Thread-safe.
class SimulatedConnection : public ConnectionBase {
  public:
    /// An end without a peer: whatever is sent fails.
    SimulatedConnection(std::int32_t processIdentifier, Dictionary entitlements)
        : ConnectionBase("com.quillon.kelvod.simulated-connection"),
          processIdentifier_(processIdentifier),
          entitlements_(std::move(entitlements)) {}

    /// Makes two ends each other's peers.
    static void join(const std::shared_ptr<SimulatedConnection>& one,
                     const std::shared_ptr<SimulatedConnection>& other);

    std::int32_t processIdentifier() const override { return processIdentifier_; }
    Value valueForEntitlement(std::string_view name) const override {
        const Value* value = entitlements_.find(name);
        return value != nullptr ? *value : Value();
    }

    URL urlForPeer(const URL& url) const override { return URL(url.absoluteString() + peerSuffix); }
    URL urlFromPeer(const URL& url) const override {
        const std::string& text = url.absoluteString();
        return URL(text.ends_with(peerSuffix) ? text.substr(0, text.size() - peerSuffix.size()) : text);
    }
    /// Stands behind every URL as the peer sees it, so that a test sees whether it was translated.
    std::string peerSuffix;

    /// Sends a message as a peer could that keeps no rule: the arguments need not fit.
    void sendRaw(std::size_t method, const Array& arguments);
    /// Waits until everything has run that arrived so far; says how much that was since the connection began.
    std::uint64_t drain();

  protected:
    OptionalError transmit(const IPCInterface& interface, std::size_t method, const Array& arguments,
                           ReplyIdentifier identifier, const ErrorReport& whenUnsent) override;
    void close() override;

  private:
    std::shared_ptr<SimulatedConnection> peer() const { return peer_.copy().lock(); }
    void deliver(std::size_t method, const Array& arguments, ReplyIdentifier identifier);
    void note() { ++activity_; }

    const std::int32_t processIdentifier_;
    const Dictionary entitlements_;
    Guarded<std::weak_ptr<SimulatedConnection>> peer_;
    std::atomic<std::uint64_t> activity_{0};
};

using SimulatedConnectionRef = std::shared_ptr<SimulatedConnection>;

/// A listener that remembers whether it was resumed. Thread-safe.
class SimulatedListener : public IPCListener {
  public:
    explicit SimulatedListener(std::string serviceName) : serviceName_(std::move(serviceName)) {}

    void setDelegate(std::weak_ptr<IPCListenerDelegate> delegate) override {
        delegate_.set(std::move(delegate));
    }
    void resume() override { ++resumeCount_; }
    std::shared_ptr<IPCEndpoint> endpoint() const override { return endpoint_.copy(); }
    void setEndpoint(std::shared_ptr<IPCEndpoint> endpoint) { endpoint_.set(std::move(endpoint)); }

    const std::string& serviceName() const { return serviceName_; }
    std::shared_ptr<IPCListenerDelegate> delegate() const { return delegate_.copy().lock(); }
    int resumeCount() const { return resumeCount_; }

  private:
    const std::string serviceName_;
    Guarded<std::weak_ptr<IPCListenerDelegate>> delegate_;
    Guarded<std::shared_ptr<IPCEndpoint>> endpoint_;
    std::atomic<int> resumeCount_{0};
};

/// The way to an anonymous listener of this process.
class SimulatedEndpoint : public IPCEndpoint {
  public:
    explicit SimulatedEndpoint(std::weak_ptr<SimulatedListener> listener) : listener_(std::move(listener)) {}
    std::shared_ptr<SimulatedListener> listener() const { return listener_.lock(); }

  private:
    const std::weak_ptr<SimulatedListener> listener_;
};

/// A transport inside one process: connections have queues of their own, and a test says who the peers are.
/// Thread-safe.
class SimulatedIPC : public IPCTransport {
  public:
    /// Who connects next from this process: the identity that listeners see.
    void setIdentity(std::int32_t processIdentifier, Dictionary entitlements);

    std::shared_ptr<IPCListener> createListener(std::string_view serviceName) override;
    Result<std::shared_ptr<IPCListener>> createAnonymousListener() override;
    Result<IPCConnectionRef> connectToService(std::string_view serviceName) override;
    Result<IPCConnectionRef> connectToEndpoint(const std::shared_ptr<IPCEndpoint>& endpoint) override;
    IPCConnectionRef currentConnection() override;

    /// The connection on which the request came that is served from now on; none ends it.
    void setCurrentConnection(IPCConnectionRef connection) { current_.set(std::move(connection)); }
    /// Those that have not gone, oldest first.
    std::vector<std::shared_ptr<SimulatedListener>> listeners() const;

    /// Waits until no connection of this transport has anything left to do, and says whether anything was
    /// done.
    bool settle();

  private:
    struct Identity {
        std::int32_t processIdentifier = 1;
        Dictionary entitlements;
    };
    std::shared_ptr<SimulatedListener> listenerNamed(std::string_view serviceName) const;
    Result<IPCConnectionRef> connectTo(const std::shared_ptr<SimulatedListener>& listener);
    std::uint64_t drainAll();
    void letGoOfWhatIsOver();

    Guarded<Identity> identity_;
    Guarded<IPCConnectionRef> current_;
    Guarded<std::vector<std::weak_ptr<SimulatedListener>>> listeners_;
    // Held until they have ended and nothing runs for them any more.
    Guarded<std::vector<SimulatedConnectionRef>> connections_;
    std::atomic<std::uint64_t> activityOfThoseGone_{0};
    std::atomic<std::uint64_t> settledActivity_{0};
};

}  // namespace kelvo
