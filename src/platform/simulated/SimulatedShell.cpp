#include "platform/simulated/SimulatedShell.h"

#include "platform/PendingAlert.h"

#include <utility>

namespace kelvo {

class SimulatedBulletins::Proxy : public BulletinProxy {
  public:
    explicit Proxy(std::shared_ptr<Requests> requests) : requests_(std::move(requests)) {}
    void withdrawAllBulletins() override {
        requests_->with([](auto& all) { all.push_back("withdraw all"); });
    }

  private:
    std::shared_ptr<Requests> requests_;
};

class SimulatedBulletins::Connection : public BulletinConnection {
  public:
    explicit Connection(std::shared_ptr<Requests> requests) : requests_(std::move(requests)) {}
    std::shared_ptr<BulletinProxy> registerDataProvider(std::weak_ptr<BulletinDataProvider>) override {
        requests_->with([](auto& all) { all.push_back("register"); });
        return std::make_shared<Proxy>(requests_);
    }

  private:
    std::shared_ptr<Requests> requests_;
};

std::shared_ptr<BulletinConnection> SimulatedBulletins::connect(std::string_view serviceName,
                                                                SerialQueue& queue) {
    requests_->with(
        [&](auto& all) { all.push_back("connect " + std::string(serviceName) + " " + queue.label()); });
    return std::make_shared<Connection>(requests_);
}

class SimulatedAlerts::Alert : public PendingAlert {};

Result<std::shared_ptr<SystemAlert>> SimulatedAlerts::createAlert(const SystemAlertContent& content) {
    if (const OptionalError fault = faults_->take("SystemAlert.createAlert")) return *fault;
    const auto alert = std::make_shared<Alert>();
    screen_.with([&](Screen& screen) {
        screen.shown.push_back(content);
        screen.current = alert;
        if (screen.prepared.empty()) return;
        alert->answer(screen.prepared.front());
        screen.prepared.pop_front();
    });
    return std::shared_ptr<SystemAlert>(alert);
}

void SimulatedAlerts::answer(SystemAlertResponse response) {
    screen_.with([&](Screen& screen) {
        const auto current = screen.current.lock();
        if (!current || !current->answer(response)) screen.prepared.push_back(response);
    });
}

std::vector<SystemAlertContent> SimulatedAlerts::shownAlerts() const {
    return screen_.with([](const Screen& screen) { return screen.shown; });
}

}  // namespace kelvo
