#include "platform/linux/x11/DesktopReader.h"

#include "platform/linux/x11/XWindows.h"

#include <algorithm>
#include <string>
#include <utility>

namespace kelvo::x11 {
namespace {

constexpr std::uint32_t kAllDesktops = 0xFFFFFFFF;
constexpr std::uint32_t kMostItems = 64;
constexpr int kDeepestHierarchy = 32;

std::vector<std::uint32_t> itemsOf(const xcb_get_property_reply_t* reply) {
    if (reply == nullptr || reply->format != 32) return {};
    const auto* const values = static_cast<const std::uint32_t*>(xcb_get_property_value(reply));
    return {values, values + reply->value_len};
}

bool holds(const std::vector<std::uint32_t>& items, std::uint32_t item) {
    return std::ranges::find(items, item) != items.end();
}

}  // namespace

/// The questions about one window, all on their way before the first answer is waited for.
struct DesktopReader::Asked {
    xcb_window_t window;
    xcb_get_window_attributes_cookie_t attributes;
    xcb_get_geometry_cookie_t geometry;
    xcb_translate_coordinates_cookie_t origin;
    xcb_get_property_cookie_t state;
    xcb_get_property_cookie_t type;
    xcb_get_property_cookie_t desktop;
    xcb_res_query_client_ids_cookie_t creator;
};

/// One look: what holds for all windows, and what they gave.
struct DesktopReader::Context {
    xcb_window_t active;
    std::uint32_t desktop;
    std::map<std::int32_t, DesktopApplication> applications;
    std::vector<DesktopWindow> visible;  ///< from the bottom to the top
};

std::optional<DesktopReader> DesktopReader::open(XConnection& connection) {
    if (!canTellCreators(connection)) return std::nullopt;
    return DesktopReader(connection);
}

std::optional<DesktopView> DesktopReader::read() {
    hasManager_ = windowManagersWindow(*connection_) != XCB_NONE;
    windows_ = topLevelWindows();
    Context context{activeWindow(), currentDesktop(), {}, {}};
    std::vector<Asked> asked;
    for (const xcb_window_t window : windows_)
        asked.push_back(ask(window));
    for (const Asked& one : asked)
        take(one, context);

    DesktopView view;
    for (const auto& [process, application] : context.applications)
        view.applications.push_back(application);
    view.sharing = countSharing(context.visible, area(context.desktop));
    if (connection_->isBroken() || connection_->hasGivenUp()) return std::nullopt;
    return view;
}

bool DesktopReader::selectEvents() {
    const std::uint32_t ofRoot =
        XCB_EVENT_MASK_PROPERTY_CHANGE | XCB_EVENT_MASK_SUBSTRUCTURE_NOTIFY | XCB_EVENT_MASK_FOCUS_CHANGE;
    const std::uint32_t ofWindow =
        XCB_EVENT_MASK_PROPERTY_CHANGE | XCB_EVENT_MASK_STRUCTURE_NOTIFY | XCB_EVENT_MASK_FOCUS_CHANGE;
    xcb_connection_t* const c = connection_->raw();
    std::vector<xcb_window_t> wanted = windows_;
    wanted.push_back(connection_->root());
    bool isNew = false;
    for (const xcb_window_t window : wanted) {
        if (holds(selected_, window)) continue;
        const std::uint32_t* const mask = window == connection_->root() ? &ofRoot : &ofWindow;
        xcb_change_window_attributes(c, window, XCB_CW_EVENT_MASK, mask);
        isNew = true;
    }
    selected_ = std::move(wanted);
    return isNew;
}

void DesktopReader::forget(xcb_window_t window) {
    std::erase(selected_, window);
}

/// From the bottom to the top.
std::vector<xcb_window_t> DesktopReader::topLevelWindows() {
    if (hasManager_) {
        auto windows = rootItems("_NET_CLIENT_LIST_STACKING");
        return windows.empty() ? rootItems("_NET_CLIENT_LIST") : windows;
    }
    const auto tree =
        connection_->await<xcb_query_tree_reply_t>(xcb_query_tree(connection_->raw(), connection_->root()));
    if (!tree) return {};
    const xcb_window_t* const children = xcb_query_tree_children(tree.get());
    return {children, children + xcb_query_tree_children_length(tree.get())};
}

xcb_window_t DesktopReader::activeWindow() {
    if (!hasManager_) return focusedTopLevel();
    const auto active = rootItems("_NET_ACTIVE_WINDOW");
    return active.empty() ? focusedTopLevel() : active.front();
}

/// The top-level window that has the keyboard or holds the one that has it.
xcb_window_t DesktopReader::focusedTopLevel() {
    xcb_connection_t* const c = connection_->raw();
    const auto focus = connection_->await<xcb_get_input_focus_reply_t>(xcb_get_input_focus(c));
    xcb_window_t window = focus ? focus->focus : static_cast<xcb_window_t>(XCB_NONE);
    for (int depth = 0; depth < kDeepestHierarchy && window > XCB_INPUT_FOCUS_POINTER_ROOT; ++depth) {
        if (holds(windows_, window)) return window;
        const auto tree = connection_->await<xcb_query_tree_reply_t>(xcb_query_tree(c, window));
        window = tree ? tree->parent : static_cast<xcb_window_t>(XCB_NONE);
    }
    return XCB_NONE;
}

DesktopArea DesktopReader::area(std::uint32_t desktop) {
    const auto areas = hasManager_ ? rootItems("_NET_WORKAREA") : std::vector<std::uint32_t>();
    const std::size_t own = std::size_t{4} * (desktop == kAllDesktops ? 0 : desktop);
    if (areas.size() >= own + 4) return {static_cast<int>(areas[own + 2]), static_cast<int>(areas[own + 3])};
    // The root's size, as it is now: the one in the connection's set-up is that of its beginning.
    const auto root = connection_->await<xcb_get_geometry_reply_t>(
        xcb_get_geometry(connection_->raw(), connection_->root()));
    return root ? DesktopArea{root->width, root->height} : DesktopArea();
}

std::uint32_t DesktopReader::currentDesktop() {
    const auto current = hasManager_ ? rootItems("_NET_CURRENT_DESKTOP") : std::vector<std::uint32_t>();
    return current.empty() ? kAllDesktops : current.front();
}

DesktopReader::Asked DesktopReader::ask(xcb_window_t window) {
    xcb_connection_t* const c = connection_->raw();
    const auto property = [&](std::string_view name) {
        return xcb_get_property(c, 0, window, atom(name), XCB_GET_PROPERTY_TYPE_ANY, 0, kMostItems);
    };
    return {window,
            xcb_get_window_attributes(c, window),
            xcb_get_geometry(c, window),
            xcb_translate_coordinates(c, window, connection_->root(), 0, 0),
            property("_NET_WM_STATE"),
            property("_NET_WM_WINDOW_TYPE"),
            property("_NET_WM_DESKTOP"),
            askCreator(*connection_, window)};
}

/// Notes whose window it is, and where, if the user can see it.
void DesktopReader::take(const Asked& asked, Context& context) {
    const auto attributes = connection_->await<xcb_get_window_attributes_reply_t>(asked.attributes);
    const auto geometry = connection_->await<xcb_get_geometry_reply_t>(asked.geometry);
    const auto origin = connection_->await<xcb_translate_coordinates_reply_t>(asked.origin);
    const auto state = itemsOf(connection_->await<xcb_get_property_reply_t>(asked.state).get());
    const auto types = itemsOf(connection_->await<xcb_get_property_reply_t>(asked.type).get());
    const auto desktops = itemsOf(connection_->await<xcb_get_property_reply_t>(asked.desktop).get());
    // Asked each time: a program that starts may get the number of a window that went.
    const auto process = creatorIn(*connection_, asked.creator);
    if (!attributes || !geometry || !origin || attributes->_class != XCB_WINDOW_CLASS_INPUT_OUTPUT) return;
    if (!hasManager_ && attributes->override_redirect != 0) return;
    for (const char* furniture :
         {"_NET_WM_WINDOW_TYPE_DESKTOP", "_NET_WM_WINDOW_TYPE_DOCK", "_NET_WM_WINDOW_TYPE_NOTIFICATION"}) {
        if (holds(types, atom(furniture))) return;
    }
    if (!process) return;
    DesktopApplication& application = context.applications[*process];
    application.processIdentifier = *process;
    const bool isElsewhere = !desktops.empty() && desktops.front() != kAllDesktops &&
                             context.desktop != kAllDesktops && desktops.front() != context.desktop;
    const bool isHidden = holds(state, atom("_NET_WM_STATE_HIDDEN"));
    if (isElsewhere || isHidden || attributes->map_state != XCB_MAP_STATE_VIEWABLE) return;
    const bool isActive = asked.window == context.active;
    application.isVisible = true;
    application.isActive |= isActive;
    context.visible.push_back(
        {*process, origin->dst_x, origin->dst_y, geometry->width, geometry->height, isActive});
}

xcb_atom_t DesktopReader::atom(std::string_view name) {
    const auto known = atoms_.find(name);
    if (known != atoms_.end()) return known->second;
    const xcb_atom_t asked = connection_->atom(name);
    if (asked != XCB_ATOM_NONE) atoms_.emplace(name, asked);
    return asked;
}

std::vector<std::uint32_t> DesktopReader::rootItems(std::string_view property) {
    return itemsIn(*connection_, connection_->root(), property);
}

}  // namespace kelvo::x11
