#pragma once

#include "base/Guarded.h"
#include "platform/BulletinService.h"
#include "platform/SystemAlert.h"
#include "platform/simulated/SimulatedFaults.h"

#include <deque>
#include <map>
#include <string>
#include <vector>

namespace kelvo {

/// A bulletin service that remembers what was asked of it. Thread-safe.
class SimulatedBulletins : public BulletinService {
  public:
    std::shared_ptr<BulletinConnection> connect(std::string_view serviceName, SerialQueue& queue) override;

    /// "connect NAME QUEUE", "register", "withdraw all", "post" and "interrupt", in the order in which they
    /// came.
    std::vector<std::string> requests() const { return requests_->copy(); }
    /// What was posted, in order.
    std::vector<BulletinRequest> bulletins() const { return bulletins_->copy(); }

  private:
    using Bulletins = Guarded<std::vector<BulletinRequest>>;
    using Requests = Guarded<std::vector<std::string>>;
    class Connection;
    class Proxy;
    std::shared_ptr<Requests> requests_ = std::make_shared<Requests>();
    std::shared_ptr<Bulletins> bulletins_ = std::make_shared<Bulletins>();
};

/// A user who answers alerts as a test has decided beforehand, or while the alert is up. Thread-safe.
class SimulatedAlerts : public SystemAlertService {
  public:
    explicit SimulatedAlerts(std::shared_ptr<SimulatedFaults> faults) : faults_(std::move(faults)) {}

    Result<std::shared_ptr<SystemAlert>> createAlert(const SystemAlertContent& content) override;

    void close() override;

    /// Answers the alert that is up, or else the next one.
    void answer(SystemAlertResponse response);

    /// Every alert that was shown, in order.
    std::vector<SystemAlertContent> shownAlerts() const;

  private:
    class Alert;
    struct Screen {
        std::vector<SystemAlertContent> shown;
        std::deque<SystemAlertResponse> prepared;
        std::weak_ptr<Alert> current;
        bool isClosed = false;
    };
    std::shared_ptr<SimulatedFaults> faults_;
    Guarded<Screen> screen_;
};

}  // namespace kelvo
