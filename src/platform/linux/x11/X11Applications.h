#pragma once

#include "base/SerialQueue.h"
#include "platform/ApplicationState.h"
#include "platform/Bundles.h"
#include "platform/linux/x11/DesktopWatch.h"

#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace kelvo::x11 {

/// Applications as an X desktop shows them. The one that has the user's input is in the foreground and
/// frontmost; one that is on the screen without it is obscured; one whose windows are hidden, or gone, runs
/// in the background. A program without a bundle goes by its path. Where no display can be reached nothing
/// runs.
///
/// Each query asks the server anew, waiting two seconds at most, and knows those alone that have windows;
/// queries wait for each other. While a server stands still nothing runs, as far as queries can tell, and the
/// watch tells of no change. Thread-safe.
class X11Applications : public ApplicationStateSource {
  public:
    X11Applications(std::string display, std::shared_ptr<BundleService> bundles);
    ~X11Applications() override;

    void setUpdateHandler(UpdateHandler handler) override;
    std::optional<ApplicationInformation> informationOfProcess(std::int32_t processIdentifier) override;
    void informationOfApplication(std::string_view bundleIdentifier, InformationHandler handler) override;
    std::int32_t stateOfApplication(std::string_view bundleIdentifier) override;
    std::optional<std::string> frontmostApplicationBundleIdentifier() override;

  private:
    using Known = std::map<std::int32_t, ApplicationInformation>;

    DesktopView currentView();
    Known currentApplications();
    Known applicationsIn(const DesktopView& view, const Known& before) const;
    std::string identifierOf(std::int32_t processIdentifier) const;
    std::optional<ApplicationInformation> find(std::string_view bundleIdentifier);
    void viewChanged(const DesktopView& view);

    const std::string display_;
    const std::shared_ptr<BundleService> bundles_;
    std::mutex connectionMutex_;
    std::unique_ptr<XConnection> connection_;
    std::optional<DesktopReader> reader_;

    struct Installed {
        std::shared_ptr<UpdateHandler> handler;
        int order = 0;  ///< counts the calls of `setUpdateHandler`
    };
    Guarded<Installed> handler_;
    Known known_;  // on the queue

    SerialQueue queue_{"com.quillon.kelvod.applications"};
    DesktopWatch watch_;  // ends before what its handler uses
};

}  // namespace kelvo::x11
