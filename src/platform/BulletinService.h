#pragma once

#include "base/Date.h"
#include "base/SerialQueue.h"
#include "base/URL.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kelvo {

/// A button of a bulletin.
struct BulletinAction {
    std::string identifier;
    std::string title;
    std::int64_t activationMode = 0;
    std::optional<URL> launchURL;  ///< opened by the service itself

    friend bool operator==(const BulletinAction&, const BulletinAction&) = default;
};

/// One bulletin to be shown.
struct BulletinRequest {
    std::string sectionIdentifier;
    std::string recordIdentifier;  ///< a bulletin replaces the one of the same identifier
    std::string title;
    std::string message;
    Date date;
    std::string iconBundlePath;  ///< the bundle that holds the icon
    std::string iconName;
    URL defaultActionURL;  ///< opened when the user chooses the bulletin itself
    std::vector<BulletinAction> supplementaryActions;
};

/// How a provider's bulletins are gathered for the user.
struct BulletinSection {
    std::string identifier;
    std::int64_t mostMessageLines = 0;
    std::int64_t type = 0;
    bool isSuppressedFromSettings = false;
    std::string sortKey;
    bool isSortedAscending = true;
};

/// Supplies bulletins; called on the connection's queue.
class BulletinDataProvider {
  public:
    virtual ~BulletinDataProvider() = default;
    virtual BulletinSection bulletinSection() = 0;
    /// The user chose the action of that identifier.
    virtual void handleBulletinActionResponse(const std::string& actionIdentifier) = 0;
};

/// Posts and withdraws one provider's bulletins. Any thread; the traffic runs on the connection's queue.
class BulletinProxy {
  public:
    virtual ~BulletinProxy() = default;
    /// Withdraws every bulletin that this provider ever posted, in earlier processes too.
    virtual void withdrawAllBulletins() = 0;
    /// Shows a bulletin; `interrupts`: at once, above what the user does.
    virtual void postBulletin(const BulletinRequest& request, bool interrupts) = 0;
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
