#pragma once

#include "platform/Accessibility.h"
#include "platform/BulletinService.h"
#include "platform/CallObserver.h"
#include "platform/RestrictionsProfile.h"

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
        void postBulletin(const BulletinRequest&, bool) override {}
    };
    class Connection : public BulletinConnection {
      public:
        std::shared_ptr<BulletinProxy> registerDataProvider(std::weak_ptr<BulletinDataProvider>) override {
            return std::make_shared<Proxy>();
        }
    };
};

/// A device that reads nothing to its user.
class UnreadScreen : public Accessibility {
  public:
    bool isScreenReaderRunning() override { return false; }
};

}  // namespace kelvo
