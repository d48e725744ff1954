#include "platform/linux/x11/WindowsPicture.h"

#include <algorithm>
#include <cmath>
#include <map>

namespace kelvo::x11 {
namespace {

constexpr std::uint32_t kAllPlanes = ~std::uint32_t{0};

std::uint16_t wholeSide(double side) {
    return static_cast<std::uint16_t>(std::clamp(std::lround(side), 1L, 16384L));
}

}  // namespace

bool WindowsPicture::watch() {
    xcb_connection_t* const c = connection_.raw();
    if (!render_.begin(connection_) || !connection_.hasExtension(xcb_composite_id)) return false;
    connection_.await<xcb_composite_query_version_reply_t>(xcb_composite_query_version(c, 0, 4));
    damageEvent_ =
        static_cast<std::uint8_t>(xcb_get_extension_data(c, &xcb_damage_id)->first_event + XCB_DAMAGE_NOTIFY);
    canvas_ =
        std::make_unique<XCanvas>(connection_, render_, wholeSide(size_.width), wholeSide(size_.height));
    for (const std::uint32_t window : wanted_) {
        if (window == connection_.root()) continue;
        windows_.push_back(std::make_unique<TrackedWindow>(connection_, render_, window));
    }
    return true;
}

bool WindowsPicture::handle(const xcb_generic_event_t& event) {
    const auto type = static_cast<std::uint8_t>(event.response_type & 0x7F);
    if (type == damageEvent_) return true;
    switch (type) {
        case XCB_MAP_NOTIFY:
        case XCB_UNMAP_NOTIFY:
        case XCB_REPARENT_NOTIFY:
            for (const auto& window : windows_)
                window->forgetStorage();
            [[fallthrough]];
        case XCB_CONFIGURE_NOTIFY:
        case XCB_DESTROY_NOTIFY:
        case XCB_GRAVITY_NOTIFY:
        case XCB_CIRCULATE_NOTIFY:
            structureChanged_ = true;
            return true;
        default:
            return false;
    }
}

unsigned WindowsPicture::rearm() {
    unsigned first = 0;
    for (const auto& window : windows_) {
        const unsigned sequence = window->rearm();
        if (first == 0) first = sequence;
    }
    return first;
}

VideoSurface::Geometry WindowsPicture::refresh() {
    if (structureChanged_) {
        structureChanged_ = false;
        std::erase_if(windows_, [](const auto& window) { return !window->refresh(); });
        sortByStacking();
    }
    return VideoSurface::Geometry::packed(canvas_->width(), canvas_->height());
}

/// Puts the windows into the order in which they are stacked; those of one top-level window keep theirs.
void WindowsPicture::sortByStacking() {
    const auto tree =
        connection_.await<xcb_query_tree_reply_t>(xcb_query_tree(connection_.raw(), connection_.root()));
    if (!tree) return;
    const xcb_window_t* const children = xcb_query_tree_children(tree.get());
    std::map<xcb_window_t, int> heights;
    for (int i = 0; i < xcb_query_tree_children_length(tree.get()); ++i)
        heights[children[i]] = i;
    std::ranges::stable_sort(windows_, {}, [&](const auto& window) { return heights[window->topLevel()]; });
}

/// The window whose corner is the corner of the frame.
const TrackedWindow* WindowsPicture::anchor() const {
    const TrackedWindow* largest = nullptr;
    const auto area = [](const TrackedWindow& window) {
        return std::uint64_t{window.width()} * window.height();
    };
    for (const auto& window : windows_) {
        if (!window->isViewable()) continue;
        if (largest == nullptr || area(*window) > area(*largest)) largest = window.get();
    }
    return largest;
}

void WindowsPicture::compose() {
    canvas_->fillBlack();
    const TrackedWindow* const origin = anchor();
    if (origin == nullptr) return;
    const double scale =
        scaleToFit({static_cast<double>(origin->width()), static_cast<double>(origin->height())}, size_);
    for (const auto& window : windows_) {
        if (!window->isViewable()) continue;
        window->drawOn(*canvas_, scale, static_cast<int>(std::lround((window->x() - origin->x()) * scale)),
                       static_cast<int>(std::lround((window->y() - origin->y()) * scale)));
    }
}

bool WindowsPicture::grab(const ShmTarget& target) {
    compose();
    return connection_.await<xcb_shm_get_image_reply_t>(xcb_shm_get_image(
               connection_.raw(), canvas_->pixmap(), 0, 0, canvas_->width(), canvas_->height(), kAllPlanes,
               XCB_IMAGE_FORMAT_Z_PIXMAP, target.segment, 0)) != nullptr;
}

}  // namespace kelvo::x11
