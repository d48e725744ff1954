#include "platform/linux/x11/XAttempt.h"

#include "base/Guarded.h"
#include "base/ThreadName.h"
#include "platform/linux/x11/WakeEvent.h"

#include <array>
#include <cerrno>
#include <memory>
#include <poll.h>
#include <set>
#include <thread>
#include <utility>

namespace kelvo::x11 {
namespace {

/// The displays that leave somebody's attempt without an answer.
using SilentDisplays = Guarded<std::set<std::string>>;

const std::shared_ptr<SilentDisplays>& silentDisplays() {
    static const auto displays = std::make_shared<SilentDisplays>();
    return displays;
}

/// One call of xcb_connect, which nothing can interrupt, on a thread that may outlive whoever waits for it.
class Attempt {
  public:
    explicit Attempt(std::string display) : display_(std::move(display)) {}

    void run() {
        nameCurrentThread("kelvo.display");
        XAttempt result;
        const char* const name = display_.empty() ? nullptr : display_.c_str();
        result.connection = xcb_connect(name, &result.screenNumber);
        const bool isAwaited = state_.with([&](State& state) {
            state.result = result;
            state.isFinished = true;
            return !state.isAbandoned;
        });
        if (isAwaited) return finished_.set();
        xcb_disconnect(result.connection);
        silent_->with([this](auto& silent) { silent.erase(display_); });
    }

    XAttempt await(std::chrono::milliseconds limit, int interruptFd) {
        std::array<pollfd, 2> waits{{{finished_.descriptor(), POLLIN, 0}, {interruptFd, POLLIN, 0}}};
        while (::poll(waits.data(), waits.size(), static_cast<int>(limit.count())) < 0 && errno == EINTR) {
        }
        return state_.with([this](State& state) {
            if (state.isFinished) return std::exchange(state.result, {});
            state.isAbandoned = true;
            silent_->with([this](auto& silent) { silent.insert(display_); });
            return XAttempt();
        });
    }

  private:
    struct State {
        XAttempt result;
        bool isFinished = false;
        bool isAbandoned = false;
    };
    const std::string display_;
    const std::shared_ptr<SilentDisplays> silent_ = silentDisplays();
    Guarded<State> state_;
    WakeEvent finished_;
};

}  // namespace

XAttempt connectWithin(const std::string& display, std::chrono::milliseconds limit, int interruptFd) {
    if (silentDisplays()->with([&](const auto& silent) { return silent.contains(display); })) return {};
    const auto attempt = std::make_shared<Attempt>(display);
    std::thread([attempt] { attempt->run(); }).detach();
    return attempt->await(limit, interruptFd);
}

}  // namespace kelvo::x11
