#include "platform/linux/notifications/LoginSession.h"

#include <cstdlib>
#include <ctime>
#include <unistd.h>

#include <systemd/sd-bus.h>

namespace kelvo {
namespace {

constexpr const char* kService = "org.freedesktop.login1";
constexpr const char* kManagerPath = "/org/freedesktop/login1";
constexpr const char* kManager = "org.freedesktop.login1.Manager";
constexpr const char* kSession = "org.freedesktop.login1.Session";
constexpr std::uint64_t kCallTimeout = 2000000;  // microseconds

struct MessageCloser {
    void operator()(sd_bus_message* message) const { sd_bus_message_unref(message); }
};
using Message = std::unique_ptr<sd_bus_message, MessageCloser>;

/// The object path that a method of the manager answers for one argument; empty when it answers an error.
template <typename... Arguments>
std::string askManager(sd_bus* bus, const char* method, const char* types, Arguments... arguments) {
    sd_bus_message* raw = nullptr;
    const int result =
        sd_bus_call_method(bus, kService, kManagerPath, kManager, method, nullptr, &raw, types, arguments...);
    const Message reply(raw);
    const char* path = nullptr;
    if (result < 0 || sd_bus_message_read(reply.get(), "o", &path) < 0) return {};
    return path;
}

/// The session in a property of type (id, path); empty when there is none.
std::string sessionProperty(sd_bus* bus, const std::string& object, const char* interface,
                            const char* property) {
    if (object.empty()) return {};
    sd_bus_message* raw = nullptr;
    const int result =
        sd_bus_get_property(bus, kService, object.c_str(), interface, property, nullptr, &raw, "(so)");
    const Message reply(raw);
    const char* name = nullptr;
    const char* path = nullptr;
    if (result < 0 || sd_bus_message_read(reply.get(), "(so)", &name, &path) < 0) return {};
    return *name != '\0' ? path : "";
}

std::string findSession(sd_bus* bus) {
    const char* named =
        std::getenv("XDG_SESSION_ID");  // NOLINT(concurrency-mt-unsafe): nobody sets variables
    if (named != nullptr) {
        if (std::string path = askManager(bus, "GetSession", "s", named); !path.empty()) return path;
    }
    const std::string user = askManager(bus, "GetUser", "u", static_cast<std::uint32_t>(::getuid()));
    std::string path = sessionProperty(bus, user, "org.freedesktop.login1.User", "Display");
    if (!path.empty()) return path;
    const std::string seat = askManager(bus, "GetSeat", "s", "seat0");
    return sessionProperty(bus, seat, "org.freedesktop.login1.Seat", "ActiveSession");
}

}  // namespace

void LoginSession::BusCloser::operator()(sd_bus* bus) const {
    sd_bus_close_unref(bus);
}

std::unique_ptr<LoginSession> LoginSession::open() {
    sd_bus* raw = nullptr;
    if (sd_bus_open_system(&raw) < 0) return nullptr;
    Bus bus(raw);
    sd_bus_set_method_call_timeout(bus.get(), kCallTimeout);
    std::string path = findSession(bus.get());
    if (path.empty()) return nullptr;
    std::unique_ptr<LoginSession> session(new LoginSession(std::move(bus), std::move(path)));
    return session->watch() ? std::move(session) : nullptr;
}

LoginSession::LoginSession(Bus bus, std::string path) : bus_(std::move(bus)), path_(std::move(path)) {}
LoginSession::~LoginSession() = default;

bool LoginSession::watch() {
    const auto changed = [](sd_bus_message*, void* self, sd_bus_error*) {
        static_cast<LoginSession*>(self)->readLockedHint();
        return 0;
    };
    const int result =
        sd_bus_match_signal(bus_.get(), nullptr, kService, path_.c_str(), "org.freedesktop.DBus.Properties",
                            "PropertiesChanged", changed, this);
    if (result < 0) return false;
    readLockedHint();
    return true;
}

void LoginSession::readLockedHint() {
    int locked = 0;
    // A session that has just ended answers an error; its last state stands.
    if (sd_bus_get_property_trivial(bus_.get(), kService, path_.c_str(), kSession, "LockedHint", nullptr, 'b',
                                    &locked) >= 0) {
        isLocked_ = locked != 0;
    }
}

int LoginSession::descriptor() const {
    return sd_bus_get_fd(bus_.get());
}

short LoginSession::events() const {
    const int events = sd_bus_get_events(bus_.get());
    return static_cast<short>(events < 0 ? 0 : events);
}

std::optional<std::chrono::milliseconds> LoginSession::timeout() const {
    std::uint64_t due = UINT64_MAX;
    if (sd_bus_get_timeout(bus_.get(), &due) < 0 || due == UINT64_MAX) return std::nullopt;
    timespec now{};
    ::clock_gettime(CLOCK_MONOTONIC, &now);
    const auto nowMicroseconds =
        static_cast<std::uint64_t>(now.tv_sec) * 1000000U + static_cast<std::uint64_t>(now.tv_nsec) / 1000U;
    return std::chrono::milliseconds(due > nowMicroseconds ? (due - nowMicroseconds) / 1000U + 1 : 0);
}

bool LoginSession::process() {
    int result = 0;
    while ((result = sd_bus_process(bus_.get(), nullptr)) > 0) {
    }
    return result == 0;
}

}  // namespace kelvo
