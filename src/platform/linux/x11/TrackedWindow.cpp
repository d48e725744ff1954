#include "platform/linux/x11/TrackedWindow.h"

#include <utility>

namespace kelvo::x11 {
namespace {

constexpr std::size_t kDeepestHierarchy = 32;

void watchStructure(XConnection& connection, xcb_window_t window) {
    const std::uint32_t structure = XCB_EVENT_MASK_STRUCTURE_NOTIFY;
    xcb_change_window_attributes(connection.raw(), window, XCB_CW_EVENT_MASK, &structure);
}

}  // namespace

TrackedWindow::TrackedWindow(XConnection& connection, XRender& render, xcb_window_t window)
    : connection_(connection), render_(render), window_(window), damage_(xcb_generate_id(connection.raw())) {
    xcb_connection_t* const c = connection.raw();
    watchStructure(connection, window);
    xcb_composite_redirect_window(c, window, XCB_COMPOSITE_REDIRECT_AUTOMATIC);
    xcb_damage_create(c, damage_, window, XCB_DAMAGE_REPORT_LEVEL_NON_EMPTY);
}

TrackedWindow::~TrackedWindow() {
    dropStorage();
}

bool TrackedWindow::refresh() {
    xcb_connection_t* const c = connection_.raw();
    const auto attributesAsked = xcb_get_window_attributes(c, window_);
    const auto geometryAsked = xcb_get_geometry(c, window_);
    const auto placeAsked = xcb_translate_coordinates(c, window_, connection_.root(), 0, 0);
    const auto attributes = connection_.await<xcb_get_window_attributes_reply_t>(attributesAsked);
    const auto geometry = connection_.await<xcb_get_geometry_reply_t>(geometryAsked);
    const auto place = connection_.await<xcb_translate_coordinates_reply_t>(placeAsked);
    if (!attributes || !geometry || !place) return false;
    x_ = place->dst_x;
    y_ = place->dst_y;
    depth_ = geometry->depth;
    watchAncestors();
    isViewable_ = attributes->map_state == XCB_MAP_STATE_VIEWABLE &&
                  attributes->_class == XCB_WINDOW_CLASS_INPUT_OUTPUT && render_.formatOfDepth(depth_) != 0;
    const bool hasOtherShape =
        width_ != geometry->width || height_ != geometry->height || borderWidth_ != geometry->border_width;
    width_ = geometry->width;
    height_ = geometry->height;
    if (!isViewable_) {
        dropStorage();
    } else if (!hasStorage_ || hasOtherShape) {
        nameStorage(geometry->border_width);
    }
    return true;
}

/// A window moves, vanishes and is stacked with the windows that it lies in (a window manager's frame).
void TrackedWindow::watchAncestors() {
    std::vector<xcb_window_t> found;
    xcb_window_t window = window_;
    while (found.size() < kDeepestHierarchy) {
        const auto tree =
            connection_.await<xcb_query_tree_reply_t>(xcb_query_tree(connection_.raw(), window));
        if (!tree || tree->parent == connection_.root() || tree->parent == XCB_NONE) break;
        window = tree->parent;
        found.push_back(window);
    }
    if (found == ancestors_) return;
    for (const xcb_window_t ancestor : found)
        watchStructure(connection_, ancestor);
    ancestors_ = std::move(found);
}

/// The server gives a window new storage whenever it is mapped or resized.
void TrackedWindow::nameStorage(std::uint16_t borderWidth) {
    dropStorage();
    borderWidth_ = borderWidth;
    storage_ = xcb_generate_id(connection_.raw());
    xcb_composite_name_window_pixmap(connection_.raw(), window_, storage_);
    hasStorage_ = true;
}

void TrackedWindow::dropStorage() {
    hasStorage_ = false;
    xcb_connection_t* const c = connection_.raw();
    if (const auto picture = std::exchange(picture_, 0)) xcb_render_free_picture(c, picture);
    if (const auto storage = std::exchange(storage_, 0)) xcb_free_pixmap(c, storage);
}

void TrackedWindow::drawOn(XCanvas& canvas, double scale, int x, int y) {
    if (picture_ != 0 && pictureScale_ != scale)
        xcb_render_free_picture(connection_.raw(), std::exchange(picture_, 0));
    if (picture_ == 0) picture_ = render_.makePicture(storage_, depth_, scale);
    pictureScale_ = scale;
    const auto border = static_cast<std::int16_t>(borderWidth_);
    canvas.draw(picture_, depth_ == 32, scale, {border, border, width_, height_}, x, y);
}

unsigned TrackedWindow::rearm() const {
    return xcb_damage_subtract(connection_.raw(), damage_, XCB_NONE, XCB_NONE).sequence;
}

}  // namespace kelvo::x11
