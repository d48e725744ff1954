#pragma once

#include <chrono>
#include <cstdlib>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <xcb/xcb.h>

namespace kelvo::x11 {

struct XFree {
    void operator()(void* memory) const { std::free(memory); }
};

/// What libxcb handed out to be freed.
template <typename Content>
using XOwned = std::unique_ptr<Content, XFree>;

/// A client's connection to an X server. One thread at a time; nothing of the server's outlives it.
///
/// Waiting for a reply never outlasts the server: it ends, without a reply, when the connection breaks, and
/// with a server that stands still either after `kReplyLimit` or when the interrupt descriptor becomes
/// readable, whichever it was opened with. Once it ended for one of the last two reasons no reply is waited
/// for until `tryAgain`. An extension's requests may be sent once `hasExtension` has told of it; before that,
/// libxcb would wait for the server in its own way, which has no end.
class XConnection {
  public:
    static constexpr std::chrono::seconds kReplyLimit{2};

    /// Connects to `display` (":0"; empty takes $DISPLAY), which must be on this machine. None when it cannot
    /// be reached, within `kReplyLimit`.
    static std::unique_ptr<XConnection> open(const std::string& display);
    /// The same, but waits until `interruptFd`, which outlives the connection, becomes readable.
    static std::unique_ptr<XConnection> open(const std::string& display, int interruptFd);

    ~XConnection();
    XConnection(const XConnection&) = delete;
    XConnection& operator=(const XConnection&) = delete;

    xcb_connection_t* raw() const { return connection_; }
    const xcb_screen_t& screen() const { return *screen_; }
    xcb_window_t root() const { return screen_->root; }

    bool isBroken() const { return xcb_connection_has_error(connection_) != 0; }

    /// Whether waiting for a reply has ended without one.
    bool hasGivenUp() const { return hasGivenUp_; }
    void tryAgain() { hasGivenUp_ = false; }

    /// Whether the server stores a pixel of a 24-bit deep picture as blue, green, red and a spare byte.
    bool drawsBGRx() const;
    bool hasExtension(xcb_extension_t& extension);

    /// The reply to a request; none when the request failed or waiting ended.
    template <typename Reply, typename Cookie>
    XOwned<Reply> await(Cookie cookie) {
        return XOwned<Reply>(static_cast<Reply*>(awaitReply(cookie.sequence)));
    }

    xcb_atom_t atom(std::string_view name);

  private:
    using TimeLimit = std::optional<std::chrono::milliseconds>;

    static std::unique_ptr<XConnection> open(const std::string& display, int interruptFd,
                                             TimeLimit replyLimit);
    XConnection(xcb_connection_t* connection, const xcb_screen_t* screen, int interruptFd,
                TimeLimit replyLimit);
    void* awaitReply(unsigned sequence);
    bool waitForInput() const;

    xcb_connection_t* const connection_;
    const xcb_screen_t* const screen_;
    const int interruptFd_;
    const TimeLimit replyLimit_;
    bool hasGivenUp_ = false;
};

}  // namespace kelvo::x11
