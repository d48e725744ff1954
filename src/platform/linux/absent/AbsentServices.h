#pragma once

#include "platform/AnalyticsSink.h"
#include "platform/BulletinService.h"
#include "platform/CallObserver.h"
#include "platform/DisplayLayout.h"
#include "platform/RestrictionsProfile.h"

#include <cerrno>
#include <memory>

/// Services that this Linux device does not have (yet): each answers as a device would on which the thing in
/// question never happens. All are thread-safe, having no state.
namespace kelvo {

/// A device whose usage nobody gathers.
class UngatheredAnalytics : public AnalyticsSink {
  public:
    OptionalError send(const AnalyticsMessage&) override { return std::nullopt; }
};

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

}  // namespace kelvo
