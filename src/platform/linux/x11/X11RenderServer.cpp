#include "platform/linux/x11/X11RenderServer.h"

#include <chrono>
#include <xcb/res.h>

namespace kelvo::x11 {
namespace {

constexpr std::chrono::seconds kReplyLimit{2};
constexpr std::uint32_t kMostClients = 4096;
constexpr int kDeepestHierarchy = 32;

}  // namespace

std::optional<std::int32_t> X11RenderServer::processIdentifierOfContext(std::uint32_t contextID) {
    std::lock_guard lock(mutex_);
    if (!connect() || !windowExists(contextID)) return std::nullopt;
    const auto creator = creatorOf(contextID);
    const xcb_window_t managers = windowManagersWindow();
    if (creator && managers != XCB_NONE && creatorOf(managers) == creator) {
        const xcb_window_t framed = clientWithin(contextID);
        if (framed != XCB_NONE) return creatorOf(framed);
    }
    return creator;
}

bool X11RenderServer::connect() {
    if (connection_ && !connection_->isBroken()) return true;
    connection_ = XConnection::open(display_, -1, kReplyLimit);
    if (!connection_ || !connection_->hasExtension(xcb_res_id)) return false;
    return connection_->await<xcb_res_query_version_reply_t>(
               xcb_res_query_version(connection_->raw(), 1, 2)) != nullptr;
}

/// Asked apart, because the server tells the creator of any number in a client's range.
bool X11RenderServer::windowExists(xcb_window_t window) {
    return connection_->await<xcb_get_window_attributes_reply_t>(
               xcb_get_window_attributes(connection_->raw(), window)) != nullptr;
}

std::optional<std::int32_t> X11RenderServer::creatorOf(xcb_window_t window) {
    const xcb_res_client_id_spec_t asked{window, XCB_RES_CLIENT_ID_MASK_LOCAL_CLIENT_PID};
    const auto reply = connection_->await<xcb_res_query_client_ids_reply_t>(
        xcb_res_query_client_ids(connection_->raw(), 1, &asked));
    if (!reply) return std::nullopt;
    auto each = xcb_res_query_client_ids_ids_iterator(reply.get());
    for (; each.rem > 0; xcb_res_client_id_value_next(&each)) {
        const bool isProcess = (each.data->spec.mask & XCB_RES_CLIENT_ID_MASK_LOCAL_CLIENT_PID) != 0;
        if (isProcess && xcb_res_client_id_value_value_length(each.data) > 0)
            return static_cast<std::int32_t>(*xcb_res_client_id_value_value(each.data));
    }
    return std::nullopt;
}

/// The window by which a running window manager shows that it runs; a dead one leaves a name of a window
/// that no longer names itself.
xcb_window_t X11RenderServer::windowManagersWindow() {
    const auto claimed = windowsIn(connection_->root(), "_NET_SUPPORTING_WM_CHECK");
    if (claimed.empty()) return XCB_NONE;
    return windowsIn(claimed.front(), "_NET_SUPPORTING_WM_CHECK") == claimed ? claimed.front() : XCB_NONE;
}

xcb_window_t X11RenderServer::clientWithin(xcb_window_t frame) {
    for (const xcb_window_t client : windowsIn(connection_->root(), "_NET_CLIENT_LIST_STACKING")) {
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

std::vector<xcb_window_t> X11RenderServer::windowsIn(xcb_window_t window, std::string_view property) {
    const xcb_atom_t name = connection_->atom(property);
    const auto reply = connection_->await<xcb_get_property_reply_t>(
        xcb_get_property(connection_->raw(), 0, window, name, XCB_ATOM_WINDOW, 0, kMostClients));
    if (!reply || reply->format != 32) return {};
    const auto* const values = static_cast<const xcb_window_t*>(xcb_get_property_value(reply.get()));
    return {values, values + reply->value_len};
}

}  // namespace kelvo::x11
