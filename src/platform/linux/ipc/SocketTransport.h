#pragma once

#include "platform/Bundles.h"
#include "platform/IPC.h"
#include "platform/linux/files/DeviceRoot.h"
#include "platform/linux/ipc/SocketLoop.h"

#include <memory>

namespace kelvo {

/// D-Bus over Unix sockets, without a bus: a service is a socket of its name in the device's runtime folder,
/// "/run/kelvod". Thread-safe.
class SocketTransport : public IPCTransport {
  public:
    /// `bundles` tells which rights a peer holds; none holds any without. `clock` measures a peer's
    /// deadlines.
    SocketTransport(std::shared_ptr<const DeviceRoot> root, std::shared_ptr<BundleService> bundles,
                    SocketLoop::Clock clock = SocketWatcher::Moment::clock::now)
        : root_(std::move(root)),
          bundles_(std::move(bundles)),
          loop_(std::make_shared<SocketLoop>(std::move(clock))) {}

    ~SocketTransport() override { loop_->stop(); }
    SocketTransport(const SocketTransport&) = delete;
    SocketTransport& operator=(const SocketTransport&) = delete;

    std::shared_ptr<IPCListener> createListener(std::string_view serviceName) override;
    Result<std::shared_ptr<IPCListener>> createAnonymousListener() override;
    Result<IPCConnectionRef> connectToService(std::string_view serviceName) override;
    Result<IPCConnectionRef> connectToEndpoint(const std::shared_ptr<IPCEndpoint>& endpoint) override;
    IPCConnectionRef currentConnection() override;

    /// As `connectToService`, by the socket's path on the host. Gives up after two seconds when the daemon
    /// takes nobody and as many wait there as may.
    Result<IPCConnectionRef> connectToSocket(const std::string& hostPath);

  private:
    std::string pathOf(std::string_view serviceName) const;

    const std::shared_ptr<const DeviceRoot> root_;
    const std::shared_ptr<BundleService> bundles_;
    const std::shared_ptr<SocketLoop> loop_;
};

}  // namespace kelvo
