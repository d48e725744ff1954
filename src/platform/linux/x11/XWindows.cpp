#include "platform/linux/x11/XWindows.h"

namespace kelvo::x11 {
namespace {

constexpr std::uint32_t kMostItems = 4096;

}  // namespace

bool canTellCreators(XConnection& connection) {
    if (!connection.hasExtension(xcb_res_id)) return false;
    const auto version =
        connection.await<xcb_res_query_version_reply_t>(xcb_res_query_version(connection.raw(), 1, 2));
    return version != nullptr;
}

std::optional<std::int32_t> creatorOf(XConnection& connection, xcb_window_t window) {
    return creatorIn(connection, askCreator(connection, window));
}

xcb_res_query_client_ids_cookie_t askCreator(XConnection& connection, xcb_window_t window) {
    const xcb_res_client_id_spec_t asked{window, XCB_RES_CLIENT_ID_MASK_LOCAL_CLIENT_PID};
    return xcb_res_query_client_ids(connection.raw(), 1, &asked);
}

std::optional<std::int32_t> creatorIn(XConnection& connection, xcb_res_query_client_ids_cookie_t asked) {
    const auto reply = connection.await<xcb_res_query_client_ids_reply_t>(asked);
    if (!reply) return std::nullopt;
    auto each = xcb_res_query_client_ids_ids_iterator(reply.get());
    for (; each.rem > 0; xcb_res_client_id_value_next(&each)) {
        const bool isProcess = (each.data->spec.mask & XCB_RES_CLIENT_ID_MASK_LOCAL_CLIENT_PID) != 0;
        if (isProcess && xcb_res_client_id_value_value_length(each.data) > 0)
            return static_cast<std::int32_t>(*xcb_res_client_id_value_value(each.data));
    }
    return std::nullopt;
}

xcb_window_t windowManagersWindow(XConnection& connection) {
    const auto claimed = itemsIn(connection, connection.root(), "_NET_SUPPORTING_WM_CHECK");
    if (claimed.empty()) return XCB_NONE;
    return itemsIn(connection, claimed.front(), "_NET_SUPPORTING_WM_CHECK") == claimed ? claimed.front()
                                                                                       : XCB_NONE;
}

std::vector<std::uint32_t> itemsIn(XConnection& connection, xcb_window_t window, std::string_view property) {
    const xcb_atom_t name = connection.atom(property);
    const auto reply = connection.await<xcb_get_property_reply_t>(
        xcb_get_property(connection.raw(), 0, window, name, XCB_GET_PROPERTY_TYPE_ANY, 0, kMostItems));
    if (!reply || reply->format != 32) return {};
    const auto* const values = static_cast<const std::uint32_t*>(xcb_get_property_value(reply.get()));
    return {values, values + reply->value_len};
}

}  // namespace kelvo::x11
