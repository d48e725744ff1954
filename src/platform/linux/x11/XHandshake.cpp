#include "platform/linux/x11/XHandshake.h"

#include "base/UniqueFd.h"
#include "platform/linux/x11/WakeEvent.h"
#include "platform/linux/x11/XConnection.h"

#include <X11/Xauth.h>
#include <array>
#include <cerrno>
#include <climits>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <memory>
#include <poll.h>
#include <string_view>
#include <sys/socket.h>
#include <sys/un.h>
#include <thread>
#include <unistd.h>

namespace kelvo::x11 {
namespace {

constexpr const char* kSocketPrefix = "/tmp/.X11-unix/X";
constexpr const char* kCookie = "MIT-MAGIC-COOKIE-1";

/// Ends a handshake that must not go on. libxcb waits for the server's answer without a limit, and all that
/// brings it back is the end of the socket.
class HandshakeGuard {
  public:
    HandshakeGuard(int socket, int interruptFd, std::optional<std::chrono::milliseconds> limit)
        : socket_(::fcntl(socket, F_DUPFD_CLOEXEC, 0)), thread_([this, interruptFd, limit] {
              std::array<pollfd, 2> waits{{{done_.descriptor(), POLLIN, 0}, {interruptFd, POLLIN, 0}}};
              while (::poll(waits.data(), waits.size(), limit ? static_cast<int>(limit->count()) : -1) < 0 &&
                     errno == EINTR) {
              }
              if (waits[0].revents == 0) ::shutdown(socket_.get(), SHUT_RDWR);
          }) {}
    ~HandshakeGuard() {
        done_.set();
        thread_.join();
    }
    HandshakeGuard(const HandshakeGuard&) = delete;
    HandshakeGuard& operator=(const HandshakeGuard&) = delete;

    bool isWatching() const { return done_.descriptor() >= 0 && socket_; }

  private:
    WakeEvent done_;
    const UniqueFd socket_;  ///< ours, as libxcb closes its own when the handshake fails
    std::thread thread_;
};

/// Does not wait for a server whose queue of clients is full: that is one which takes none.
UniqueFd connectToSocket(const std::string& path, bool isAbstract) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    const std::size_t offset = isAbstract ? 1 : 0;
    std::memcpy(address.sun_path + offset, path.data(), path.size());
    const auto size = offsetof(sockaddr_un, sun_path) + offset + path.size() + (isAbstract ? 0 : 1);
    UniqueFd socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (!socket) return {};
    const auto* const target = reinterpret_cast<const sockaddr*>(&address);
    if (::connect(socket.get(), target, static_cast<socklen_t>(size)) != 0) return {};
    return socket;
}

UniqueFd connectToServer(int number) {
    const std::string path = kSocketPrefix + std::to_string(number);
    UniqueFd socket = connectToSocket(path, true);
    return socket ? std::move(socket) : connectToSocket(path, false);
}

struct XauFree {
    void operator()(Xauth* entry) const { XauDisposeAuth(entry); }
};

struct FileClose {
    void operator()(std::FILE* file) const { std::fclose(file); }
};

std::string authorityPath() {
    // NOLINTBEGIN(concurrency-mt-unsafe): nothing changes the environment once threads run
    const char* const path = std::getenv("XAUTHORITY");
    if (path != nullptr && *path != '\0') return path;
    const char* const home = std::getenv("HOME");
    // NOLINTEND(concurrency-mt-unsafe)
    return std::string(home == nullptr ? "" : home) + "/.Xauthority";
}

bool isFor(const Xauth& entry, std::string_view host, std::string_view display) {
    const bool isHere =
        entry.family == FamilyWild ||
        (entry.family == FamilyLocal && std::string_view(entry.address, entry.address_length) == host);
    const std::string_view number(entry.number, entry.number_length);
    return isHere && (number.empty() || number == display) &&
           std::string_view(entry.name, entry.name_length) == kCookie;
}

/// What the server of that number wants to see of those who may connect; none when nobody left it for us.
/// Entry by entry, as libXau's own search keeps the file's name in one place for all threads.
std::unique_ptr<Xauth, XauFree> cookieFor(int number) {
    std::array<char, HOST_NAME_MAX + 1> host{};
    if (::gethostname(host.data(), host.size() - 1) != 0) return nullptr;
    const std::string display = std::to_string(number);
    const std::unique_ptr<std::FILE, FileClose> file(std::fopen(authorityPath().c_str(), "rbe"));
    while (file) {
        std::unique_ptr<Xauth, XauFree> entry(XauReadAuth(file.get()));
        if (!entry || isFor(*entry, host.data(), display)) return entry;
    }
    return nullptr;
}

/// The server's number and the screen's; none for a server elsewhere, which could not share memory with us.
std::optional<int> serverNumber(const std::string& display, int& screen) {
    char* host = nullptr;
    int number = 0;
    const bool isName =
        xcb_parse_display(display.empty() ? nullptr : display.c_str(), &host, &number, &screen) != 0;
    const XOwned<char> owned(host);
    if (!isName || (*host != '\0' && std::strcmp(host, "unix") != 0)) return std::nullopt;
    return number;
}

}  // namespace

std::string displayName(const std::string& display) {
    if (!display.empty()) return display;
    // NOLINTNEXTLINE(concurrency-mt-unsafe): nothing changes the environment once threads run
    const char* const named = std::getenv("DISPLAY");
    return named != nullptr ? named : "";
}

std::string unreachableText(const std::string& displayName) {
    if (displayName.empty()) return "there is no display, as DISPLAY is not set for the daemon";
    return "cannot reach the display " + displayName +
           ", which must run on this machine and take whoever has the cookie in XAUTHORITY";
}

xcb_connection_t* connectTo(const std::string& display, int& screen, int interruptFd,
                            std::optional<std::chrono::milliseconds> limit) {
    const auto number = serverNumber(display, screen);
    UniqueFd socket = number ? connectToServer(*number) : UniqueFd();
    if (!socket) return nullptr;
    const auto cookie = cookieFor(*number);
    xcb_auth_info_t authority{};
    if (cookie) authority = {cookie->name_length, cookie->name, cookie->data_length, cookie->data};
    xcb_connection_t* connection = nullptr;
    {
        const HandshakeGuard guard(socket.get(), interruptFd, limit);
        if (!guard.isWatching()) return nullptr;
        connection = xcb_connect_to_fd(socket.release(), cookie ? &authority : nullptr);
    }
    if (xcb_connection_has_error(connection) == 0) return connection;
    xcb_disconnect(connection);
    return nullptr;
}

}  // namespace kelvo::x11
