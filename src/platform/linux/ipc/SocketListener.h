#pragma once

#include "base/Guarded.h"
#include "platform/Bundles.h"
#include "platform/IPC.h"
#include "platform/linux/files/DeviceRoot.h"
#include "platform/linux/ipc/SocketEndpoint.h"
#include "platform/linux/ipc/SocketLoop.h"

#include <map>
#include <memory>
#include <string>

namespace kelvo {

/// Accepts connections on a named socket, or those that holders of an endpoint send. Thread-safe.
class SocketListener : public IPCListener {
  public:
    /// Listens on the socket of that name which the service manager has handed over, if it did. Else at
    /// `path`, whose folder is made; a socket that an earlier process left there is replaced.
    static std::shared_ptr<SocketListener> named(std::string path, std::shared_ptr<SocketLoop> loop,
                                                 std::shared_ptr<BundleService> bundles,
                                                 std::shared_ptr<const DeviceRoot> root);
    static Result<std::shared_ptr<IPCListener>> anonymous(std::shared_ptr<SocketLoop> loop,
                                                          std::shared_ptr<BundleService> bundles,
                                                          std::shared_ptr<const DeviceRoot> root);
    ~SocketListener() override;

    void setDelegate(std::weak_ptr<IPCListenerDelegate> delegate) override;
    void resume() override;
    std::shared_ptr<IPCEndpoint> endpoint() const override { return endpoint_; }

  private:
    class Door;
    SocketListener(std::string path, std::shared_ptr<SocketEndpoint> endpoint, std::shared_ptr<Door> door);

    const std::string path_;  // empty: anonymous
    const std::shared_ptr<SocketEndpoint> endpoint_;
    const std::shared_ptr<Door> door_;
};

}  // namespace kelvo
