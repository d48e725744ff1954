#pragma once

#include "base/Guarded.h"
#include "platform/IPC.h"

#include <atomic>
#include <string>
#include <vector>

namespace kelvo {

/// A client's connection with the identity and the rights that a test gives it. Thread-safe.
class SimulatedConnection : public IPCConnection {
  public:
    SimulatedConnection(std::int32_t processIdentifier, Dictionary entitlements)
        : processIdentifier_(processIdentifier), entitlements_(std::move(entitlements)) {}

    std::int32_t processIdentifier() const override { return processIdentifier_; }
    Value valueForEntitlement(std::string_view name) const override {
        const Value* value = entitlements_.find(name);
        return value != nullptr ? *value : Value();
    }

  private:
    const std::int32_t processIdentifier_;
    const Dictionary entitlements_;
};

/// A listener that records whether it was resumed. Thread-safe.
class SimulatedListener : public IPCListener {
  public:
    explicit SimulatedListener(std::string serviceName) : serviceName_(std::move(serviceName)) {}

    void setDelegate(std::weak_ptr<IPCListenerDelegate> delegate) override {
        delegate_.set(std::move(delegate));
    }
    void resume() override { ++resumeCount_; }

    const std::string& serviceName() const { return serviceName_; }
    std::shared_ptr<IPCListenerDelegate> delegate() const { return delegate_.copy().lock(); }
    int resumeCount() const { return resumeCount_; }

  private:
    const std::string serviceName_;
    Guarded<std::weak_ptr<IPCListenerDelegate>> delegate_;
    std::atomic<int> resumeCount_{0};
};

/// A transport without processes. Thread-safe.
class SimulatedIPC : public IPCTransport {
  public:
    std::shared_ptr<IPCListener> createListener(std::string_view serviceName) override {
        auto listener = std::make_shared<SimulatedListener>(std::string(serviceName));
        listeners_.with([&](auto& all) { all.push_back(listener); });
        return listener;
    }
    std::shared_ptr<IPCConnection> currentConnection() override { return current_.copy(); }

    /// The connection on which the request came that is served from now on; none ends it.
    void setCurrentConnection(std::shared_ptr<IPCConnection> connection) {
        current_.set(std::move(connection));
    }
    std::vector<std::shared_ptr<SimulatedListener>> listeners() const { return listeners_.copy(); }

  private:
    Guarded<std::shared_ptr<IPCConnection>> current_;
    Guarded<std::vector<std::shared_ptr<SimulatedListener>>> listeners_;
};

}  // namespace kelvo
