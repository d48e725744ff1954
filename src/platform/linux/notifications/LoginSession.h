#pragma once

#include <chrono>
#include <memory>
#include <optional>
#include <string>

struct sd_bus;
struct sd_bus_message;

namespace kelvo {

/// The lock state of the user's session, as the login manager on the system bus tells it. Queue-bound: the
/// notification thread.
class LoginSession {
  public:
    /// The session that XDG_SESSION_ID names, else the one of the user's display, else the active one of the
    /// first seat. None without a system bus, a login manager or such a session; takes two seconds at most
    /// for each.
    static std::unique_ptr<LoginSession> open();

    ~LoginSession();
    LoginSession(const LoginSession&) = delete;
    LoginSession& operator=(const LoginSession&) = delete;

    /// What to poll: the descriptor, the events and until when.
    int descriptor() const;
    short events() const;
    std::optional<std::chrono::milliseconds> timeout() const;

    /// Handles what has arrived. False when the bus is lost.
    bool process();

    /// Whether the session is locked now.
    bool isLocked() const { return isLocked_; }

  private:
    struct BusCloser {
        void operator()(sd_bus* bus) const;
    };
    using Bus = std::unique_ptr<sd_bus, BusCloser>;

    explicit LoginSession(Bus bus, std::string path);
    bool watch();
    void readLockedHint();

    Bus bus_;
    std::string path_;
    bool isLocked_ = false;
};

}  // namespace kelvo
