#pragma once

#include "base/SerialQueue.h"

#include <memory>
#include <string_view>

namespace kelvo {

/// Supplies bulletins; asked on the connection's queue.
class BulletinDataProvider {
  public:
    virtual ~BulletinDataProvider() = default;
};

/// Posts and withdraws one provider's bulletins. Any thread; the traffic runs on the connection's queue.
class BulletinProxy {
  public:
    virtual ~BulletinProxy() = default;
    /// Withdraws every bulletin that this provider ever posted, in earlier processes too.
    virtual void withdrawAllBulletins() = 0;
};

/// A link to the notification bulletin service.
class BulletinConnection {
  public:
    virtual ~BulletinConnection() = default;
    virtual std::shared_ptr<BulletinProxy> registerDataProvider(
        std::weak_ptr<BulletinDataProvider> provider) = 0;
};

/// The notification bulletin service. Implemented by a Linux adapter that shows nothing and by the simulated
/// device.
class BulletinService {
  public:
    virtual ~BulletinService() = default;
    /// `queue` outlives the connection.
    virtual std::shared_ptr<BulletinConnection> connect(std::string_view serviceName, SerialQueue& queue) = 0;
};

}  // namespace kelvo
