#pragma once

#include "base/Guarded.h"
#include "base/MainQueue.h"
#include "platform/Accessibility.h"
#include "platform/CallObserver.h"
#include "platform/DisplayLayout.h"
#include "platform/InCarDisplay.h"
#include "platform/RestrictionsProfile.h"
#include "platform/SystemSounds.h"
#include "platform/simulated/SimulatedFaults.h"

#include <atomic>
#include <map>
#include <vector>

namespace kelvo {

/// Calls that a test makes; the delegate hears of them on the main queue. Thread-safe.
class SimulatedCallObserver : public CallObserver,
                              public std::enable_shared_from_this<SimulatedCallObserver> {
  public:
    explicit SimulatedCallObserver(std::shared_ptr<MainQueue> mainQueue) : mainQueue_(std::move(mainQueue)) {}

    void setDelegate(std::weak_ptr<CallObserverDelegate> delegate) override {
        delegate_.set(std::move(delegate));
    }
    void changeCall(const Call& call);

  private:
    std::shared_ptr<MainQueue> mainQueue_;
    Guarded<std::weak_ptr<CallObserverDelegate>> delegate_;
};

/// Restrictions that a test sets; observers hear of them on the thread that sets them. Thread-safe.
class SimulatedRestrictions : public RestrictionsProfile {
  public:
    void addObserver(std::weak_ptr<RestrictionsObserver> observer) override;
    void removeObserver(const RestrictionsObserver* observer) override;
    RestrictionSetting effectiveSetting(std::string_view restriction) override;

    void change(std::string_view restriction, RestrictionSetting setting);
    /// Observers that were added and not removed, living or not.
    std::size_t observerCount() const;

  private:
    using Observers = std::map<const RestrictionsObserver*, std::weak_ptr<RestrictionsObserver>>;
    Guarded<Observers> observers_;
    Guarded<std::map<std::string, RestrictionSetting>> settings_;
};

/// The display's layout as a test sets it; observers hear of it on the thread that sets it. Thread-safe.
class SimulatedDisplayLayout : public DisplayLayoutService {
  public:
    std::shared_ptr<DisplayLayoutMonitor> createMonitor(int displayType) override;

    void change(const DisplayLayout& layout);
    int monitorCount() const { return shared_->monitorCount.copy(); }
    std::size_t observerCount() const;
    bool isAnyMonitorInvalidated() const { return shared_->invalidated.copy(); }

  private:
    class Monitor;
    struct Shared {
        Guarded<DisplayLayout> layout;
        Guarded<std::map<const DisplayLayoutObserver*, std::weak_ptr<DisplayLayoutObserver>>> observers;
        Guarded<int> monitorCount;
        Guarded<bool> invalidated;
    };
    std::shared_ptr<Shared> shared_ = std::make_shared<Shared>();
    Guarded<std::shared_ptr<DisplayLayoutMonitor>> lastMonitor_;
};

/// Remembers which sounds were to be heard. Thread-safe.
class SimulatedSystemSounds : public SystemSounds {
  public:
    void playSystemSound(std::uint32_t soundID) override {
        played_.with([&](auto& all) { all.push_back(soundID); });
    }
    std::vector<std::uint32_t> played() const { return played_.copy(); }

  private:
    Guarded<std::vector<std::uint32_t>> played_;
};

/// A screen reader that a test switches. Thread-safe.
class SimulatedAccessibility : public Accessibility {
  public:
    bool isScreenReaderRunning() override { return isScreenReaderRunning_; }
    void setScreenReaderRunning(bool isRunning) { isScreenReaderRunning_ = isRunning; }

  private:
    std::atomic<bool> isScreenReaderRunning_{false};
};

/// A car that a test drives. Fails when "InCarDisplay.isActive" was ordered to. Thread-safe.
class SimulatedInCarDisplay : public InCarDisplay {
  public:
    explicit SimulatedInCarDisplay(std::shared_ptr<SimulatedFaults> faults) : faults_(std::move(faults)) {}

    Result<bool> isActive() override {
        if (const OptionalError fault = faults_->take("InCarDisplay.isActive")) return *fault;
        return isActive_.load();
    }
    void setActive(bool isActive) { isActive_ = isActive; }

  private:
    const std::shared_ptr<SimulatedFaults> faults_;
    std::atomic<bool> isActive_{false};
};

}  // namespace kelvo
