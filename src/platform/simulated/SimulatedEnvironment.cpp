#include "platform/simulated/SimulatedEnvironment.h"

#include <utility>

namespace kelvo {

void SimulatedCallObserver::changeCall(const Call& call) {
    mainQueue_->async([self = shared_from_this(), call] {
        if (const auto delegate = self->delegate_.copy().lock())
            delegate->callObserverCallChanged(*self, call);
    });
}

void SimulatedRestrictions::addObserver(std::weak_ptr<RestrictionsObserver> observer) {
    observers_.with([&](Observers& observers) { observers[observer.lock().get()] = observer; });
}

void SimulatedRestrictions::removeObserver(const RestrictionsObserver* observer) {
    observers_.with([&](Observers& observers) { observers.erase(observer); });
}

RestrictionSetting SimulatedRestrictions::effectiveSetting(std::string_view restriction) {
    return settings_.with([&](const auto& settings) {
        const auto entry = settings.find(std::string(restriction));
        return entry == settings.end() ? RestrictionSetting::unspecified : entry->second;
    });
}

void SimulatedRestrictions::change(std::string_view restriction, RestrictionSetting setting) {
    settings_.with([&](auto& settings) { settings[std::string(restriction)] = setting; });
    for (const auto& [key, weak] : observers_.copy()) {
        if (const auto observer = weak.lock()) {
            observer->profileConnectionDidReceiveEffectiveSettingsChangedNotification(*this);
        }
    }
}

std::size_t SimulatedRestrictions::observerCount() const {
    return observers_.copy().size();
}

class SimulatedDisplayLayout::Monitor : public DisplayLayoutMonitor {
  public:
    explicit Monitor(std::shared_ptr<Shared> shared) : shared_(std::move(shared)) {}

    DisplayLayout currentLayout() override { return shared_->layout.copy(); }
    void addObserver(std::weak_ptr<DisplayLayoutObserver> observer) override {
        shared_->observers.with([&](auto& observers) { observers[observer.lock().get()] = observer; });
    }
    void removeObserver(const DisplayLayoutObserver* observer) override {
        shared_->observers.with([&](auto& observers) { observers.erase(observer); });
    }
    void invalidate() override {
        shared_->invalidated.set(true);
        shared_->observers.set({});
    }

  private:
    std::shared_ptr<Shared> shared_;
};

std::shared_ptr<DisplayLayoutMonitor> SimulatedDisplayLayout::createMonitor(int) {
    shared_->monitorCount.with([](int& count) { ++count; });
    auto monitor = std::make_shared<Monitor>(shared_);
    lastMonitor_.set(monitor);
    return monitor;
}

void SimulatedDisplayLayout::change(const DisplayLayout& layout) {
    shared_->layout.set(layout);
    const std::shared_ptr<DisplayLayoutMonitor> monitor = lastMonitor_.copy();
    for (const auto& [key, weak] : shared_->observers.copy()) {
        if (const auto observer = weak.lock())
            observer->layoutMonitorDidUpdateDisplayLayout(*monitor, layout);
    }
}

std::size_t SimulatedDisplayLayout::observerCount() const {
    return shared_->observers.copy().size();
}

}  // namespace kelvo
