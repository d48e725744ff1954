#include "support/x11/WindowManager.h"

#include "support/Eventually.h"
#include "support/x11/XClient.h"

#include <algorithm>
#include <cstdlib>
#include <memory>
#include <vector>

namespace kelvo::test {
namespace {

struct Free {
    void operator()(void* memory) const { std::free(memory); }
};
template <typename Reply>
using Owned = std::unique_ptr<Reply, Free>;

xcb_atom_t atomOf(XClient& client, const std::string& name) {
    const auto length = static_cast<std::uint16_t>(name.size());
    const Owned<xcb_intern_atom_reply_t> reply(
        xcb_intern_atom_reply(client.raw(), xcb_intern_atom(client.raw(), 0, length, name.data()), nullptr));
    return reply ? reply->atom : static_cast<xcb_atom_t>(XCB_ATOM_NONE);
}

bool isManaged(XClient& client, xcb_window_t window) {
    const xcb_atom_t list = atomOf(client, "_NET_CLIENT_LIST");
    const auto question =
        xcb_get_property(client.raw(), 0, client.root(), list, XCB_GET_PROPERTY_TYPE_ANY, 0, 64);
    const Owned<xcb_get_property_reply_t> reply(xcb_get_property_reply(client.raw(), question, nullptr));
    if (!reply || reply->format != 32) return false;
    const auto* const windows = static_cast<const xcb_window_t*>(xcb_get_property_value(reply.get()));
    return std::find(windows, windows + reply->value_len, window) != windows + reply->value_len;
}

/// Shows a window, sees whether the manager takes it within a moment, and takes it away again.
bool managesANewWindow(XClient& client) {
    const xcb_window_t probe = client.createWindow({0, 0, 8, 8}, 0, true);
    const bool isTaken = eventually([&] { return isManaged(client, probe); }, std::chrono::milliseconds(500));
    client.destroy(probe);
    return isTaken && eventually([&] { return !isManaged(client, probe); });
}

}  // namespace

WindowManager::WindowManager(const std::string& display)
    : process_({"openbox", "--config-file", "/etc/xdg/openbox/rc.xml"}, {{"DISPLAY", display}}) {
    XClient client(display);
    isReady_ = eventually([&] { return managesANewWindow(client); }, std::chrono::seconds(30));
}

}  // namespace kelvo::test
