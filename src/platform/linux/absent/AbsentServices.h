#pragma once

#include "platform/Accessibility.h"
#include "platform/ApplicationState.h"
#include "platform/BulletinService.h"
#include "platform/CallObserver.h"
#include "platform/DisplayLayout.h"
#include "platform/InCarDisplay.h"
#include "platform/RestrictionsProfile.h"
#include "platform/SystemAlert.h"
#include "platform/SystemSounds.h"

#include <cerrno>
#include <memory>

/// Services that this Linux device does not have (yet): each answers as a device would on which the thing in
/// question never happens. All are thread-safe, having no state.
namespace kelvo {

/// A device that nobody calls.
class SilentCallObserver : public CallObserver {
  public:
    void setDelegate(std::weak_ptr<CallObserverDelegate>) override {}
};

/// A device without an administrator's restrictions.
class UnrestrictedProfile : public RestrictionsProfile {
  public:
    void addObserver(std::weak_ptr<RestrictionsObserver>) override {}
    void removeObserver(const RestrictionsObserver*) override {}
    RestrictionSetting effectiveSetting(std::string_view) override { return RestrictionSetting::unspecified; }
};

/// A display that shows one application, always.
class UnchangingDisplayLayout : public DisplayLayoutService {
  public:
    std::shared_ptr<DisplayLayoutMonitor> createMonitor(int) override { return std::make_shared<Monitor>(); }

  private:
    class Monitor : public DisplayLayoutMonitor {
      public:
        DisplayLayout currentLayout() override { return {{DisplayLayout::Element{0}}}; }
        void addObserver(std::weak_ptr<DisplayLayoutObserver>) override {}
        void removeObserver(const DisplayLayoutObserver*) override {}
        void invalidate() override {}
    };
};

/// A bulletin service that shows nothing.
class InvisibleBulletins : public BulletinService {
  public:
    std::shared_ptr<BulletinConnection> connect(std::string_view, SerialQueue&) override {
        return std::make_shared<Connection>();
    }

  private:
    class Proxy : public BulletinProxy {
      public:
        void withdrawAllBulletins() override {}
    };
    class Connection : public BulletinConnection {
      public:
        std::shared_ptr<BulletinProxy> registerDataProvider(std::weak_ptr<BulletinDataProvider>) override {
            return std::make_shared<Proxy>();
        }
    };
};

/// A device without a shell that could show an alert.
class ShelllessAlerts : public SystemAlertService {
  public:
    Result<std::shared_ptr<SystemAlert>> createAlert(const SystemAlertContent&) override {
        return KVError::posix(ENOSYS, "no system shell shows alerts");
    }
};

/// A device that makes no sound of its own.
class SilentSystemSounds : public SystemSounds {
  public:
    void playSystemSound(std::uint32_t) override {}
};

/// A device that knows nothing of its applications but that the user sees them, always.
class UnwatchedApplications : public ApplicationStateSource {
  public:
    void setUpdateHandler(UpdateHandler) override {}
    std::optional<ApplicationInformation> informationOfProcess(std::int32_t processIdentifier) override {
        ApplicationInformation information;
        information.state = kApplicationStateForeground;
        information.processIdentifier = processIdentifier;
        return information;
    }
    void informationOfApplication(std::string_view, InformationHandler handler) override {
        if (handler) handler(std::nullopt);
    }
    std::int32_t stateOfApplication(std::string_view) override { return kApplicationStateForeground; }
    std::optional<std::string> frontmostApplicationBundleIdentifier() override { return std::nullopt; }
};

/// A device that reads nothing to its user.
class UnreadScreen : public Accessibility {
  public:
    bool isScreenReaderRunning() override { return false; }
};

/// A device that is in no car.
class NoInCarDisplay : public InCarDisplay {
  public:
    Result<bool> isActive() override { return false; }
};

}  // namespace kelvo
