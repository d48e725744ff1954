#pragma once

#include "base/Guarded.h"
#include "base/UniqueFd.h"
#include "platform/linux/x11/DesktopReader.h"
#include "platform/linux/x11/WakeEvent.h"

#include <atomic>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <thread>

namespace kelvo::x11 {

/// Follows what an X desktop shows, on a thread of its own that starts with the first handler and sleeps
/// until the server tells of a change. Processes that were seen stay in the view until they end. A display
/// that is lost shows nothing any more; it is tried again once a second while somebody watches. Thread-safe;
/// not to be destroyed by its own handler.
class DesktopWatch {
  public:
    using Handler = std::function<void(const DesktopView&)>;

    /// `display` is an X display name such as ":0"; empty takes $DISPLAY.
    explicit DesktopWatch(std::string display) : display_(std::move(display)) {}
    ~DesktopWatch();
    DesktopWatch(const DesktopWatch&) = delete;
    DesktopWatch& operator=(const DesktopWatch&) = delete;

    /// Calls `handler` with the view as it is and each time that it has changed; with an empty one nobody
    /// watches. The processes of `known` count as seen.
    void setHandler(Handler handler, DesktopView known = {});

  private:
    void run();
    void watch(const Handler& handler);
    bool connect();
    void disconnect();
    void report(DesktopView view, const Handler& handler);
    void followProcesses(const DesktopView& view);
    void addUnseenProcesses(DesktopView& view) const;
    bool wait(int milliseconds);
    bool gather();
    void dropEndedProcesses();
    std::optional<DesktopView> look();
    bool takeEvents();

    const std::string display_;
    struct Task {
        Handler handler;
        DesktopView known;
    };
    Guarded<Task> task_;
    WakeEvent wake_;
    std::atomic<bool> isStopping_{false};
    Guarded<std::shared_ptr<std::thread>> thread_;

    // On the thread.
    std::unique_ptr<XConnection> connection_;
    std::optional<DesktopReader> reader_;
    std::optional<DesktopView> last_;
    std::map<std::int32_t, UniqueFd> processes_;
};

}  // namespace kelvo::x11
