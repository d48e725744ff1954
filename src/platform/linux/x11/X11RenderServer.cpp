#include "platform/linux/x11/X11RenderServer.h"

#include "platform/linux/x11/XWindows.h"

namespace kelvo::x11 {
namespace {

constexpr int kDeepestHierarchy = 32;

}  // namespace

std::optional<std::int32_t> X11RenderServer::processIdentifierOfContext(std::uint32_t contextID) {
    std::lock_guard lock(mutex_);
    if (!connect() || !windowExists(contextID)) return std::nullopt;
    const auto creator = creatorOf(*connection_, contextID);
    const xcb_window_t managers = windowManagersWindow(*connection_);
    if (creator && managers != XCB_NONE && creatorOf(*connection_, managers) == creator) {
        const xcb_window_t framed = clientWithin(contextID);
        if (framed != XCB_NONE) return creatorOf(*connection_, framed);
    }
    return creator;
}

bool X11RenderServer::connect() {
    // A server that stands still would let what it is asked pile up.
    if (connection_ && !connection_->isBroken() && !connection_->hasGivenUp()) return true;
    connection_ = XConnection::open(display_);
    // One that did not answer so far is of no use later: its extension may not be asked for anything.
    if (connection_ && !canTellCreators(*connection_)) connection_.reset();
    return connection_ != nullptr;
}

/// Asked apart, because the server tells the creator of any number in a client's range.
bool X11RenderServer::windowExists(xcb_window_t window) {
    return connection_->await<xcb_get_window_attributes_reply_t>(
               xcb_get_window_attributes(connection_->raw(), window)) != nullptr;
}

xcb_window_t X11RenderServer::clientWithin(xcb_window_t frame) {
    for (const xcb_window_t client :
         itemsIn(*connection_, connection_->root(), "_NET_CLIENT_LIST_STACKING")) {
        if (isWithin(client, frame)) return client;
    }
    return XCB_NONE;
}

bool X11RenderServer::isWithin(xcb_window_t window, xcb_window_t ancestor) {
    for (int depth = 0; depth < kDeepestHierarchy; ++depth) {
        const auto tree =
            connection_->await<xcb_query_tree_reply_t>(xcb_query_tree(connection_->raw(), window));
        if (!tree || tree->parent == XCB_NONE) return false;
        if (tree->parent == ancestor) return true;
        window = tree->parent;
    }
    return false;
}

}  // namespace kelvo::x11
