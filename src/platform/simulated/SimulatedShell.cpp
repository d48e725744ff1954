#include "platform/simulated/SimulatedShell.h"

#include "platform/PendingAlert.h"

#include <cerrno>
#include <utility>

namespace kelvo {

class SimulatedBulletins::Proxy : public BulletinProxy {
  public:
    Proxy(std::shared_ptr<Requests> requests, std::shared_ptr<Bulletins> bulletins)
        : requests_(std::move(requests)), bulletins_(std::move(bulletins)) {}
    void withdrawAllBulletins() override {
        requests_->with([](auto& all) { all.push_back("withdraw all"); });
    }
    void postBulletin(const BulletinRequest& request, bool interrupts) override {
        requests_->with([&](auto& all) { all.push_back(interrupts ? "interrupt" : "post"); });
        bulletins_->with([&](auto& all) { all.push_back(request); });
    }

  private:
    std::shared_ptr<Requests> requests_;
    std::shared_ptr<Bulletins> bulletins_;
};

class SimulatedBulletins::Connection : public BulletinConnection {
  public:
    Connection(std::shared_ptr<Requests> requests, std::shared_ptr<Bulletins> bulletins)
        : requests_(std::move(requests)), bulletins_(std::move(bulletins)) {}
    std::shared_ptr<BulletinProxy> registerDataProvider(std::weak_ptr<BulletinDataProvider>) override {
        requests_->with([](auto& all) { all.push_back("register"); });
        return std::make_shared<Proxy>(requests_, bulletins_);
    }

  private:
    std::shared_ptr<Requests> requests_;
    std::shared_ptr<Bulletins> bulletins_;
};

std::shared_ptr<BulletinConnection> SimulatedBulletins::connect(std::string_view serviceName,
                                                                SerialQueue& queue) {
    requests_->with(
        [&](auto& all) { all.push_back("connect " + std::string(serviceName) + " " + queue.label()); });
    return std::make_shared<Connection>(requests_, bulletins_);
}

class SimulatedAlerts::Alert : public PendingAlert {};

Result<std::shared_ptr<SystemAlert>> SimulatedAlerts::createAlert(const SystemAlertContent& content) {
    if (const OptionalError fault = faults_->take("SystemAlert.createAlert")) return *fault;
    auto alert = std::make_shared<Alert>();
    screen_.with([&](Screen& screen) {
        if (screen.isClosed) {
            alert = nullptr;
            return;
        }
        screen.shown.push_back(content);
        screen.current = alert;
        if (screen.prepared.empty()) return;
        alert->answer(screen.prepared.front());
        screen.prepared.pop_front();
    });
    if (!alert) return KVError::posix(ENOTCONN, "no system shell shows alerts");
    return std::shared_ptr<SystemAlert>(alert);
}

void SimulatedAlerts::close() {
    screen_.with([](Screen& screen) {
        screen.isClosed = true;
        if (const auto current = screen.current.lock()) current->answer(SystemAlertResponse::cancelled);
    });
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
