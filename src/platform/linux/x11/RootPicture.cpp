#include "platform/linux/x11/RootPicture.h"

#include "platform/linux/x11/CursorImage.h"

#include <algorithm>
#include <cmath>
#include <utility>
#include <xcb/xinput.h>

namespace kelvo::x11 {
namespace {

constexpr std::uint32_t kAllPlanes = ~std::uint32_t{0};

/// `limit`, turned by a quarter when it stands upright and the screen lies, or the other way round.
Size turnedLike(const Size& screen, Size limit) {
    if ((screen.width < screen.height) != (limit.width < limit.height)) std::swap(limit.width, limit.height);
    return limit;
}

std::uint16_t scaledSide(std::uint16_t side, double scale) {
    return static_cast<std::uint16_t>(std::max(1L, std::lround(side * scale)));
}

}  // namespace

bool RootPicture::watch() {
    xcb_connection_t* const c = connection_.raw();
    if (!render_.begin(connection_)) return false;
    damageEvent_ =
        static_cast<std::uint8_t>(xcb_get_extension_data(c, &xcb_damage_id)->first_event + XCB_DAMAGE_NOTIFY);
    screenWidth_ = connection_.screen().width_in_pixels;
    screenHeight_ = connection_.screen().height_in_pixels;
    const std::uint32_t structure = XCB_EVENT_MASK_STRUCTURE_NOTIFY;
    xcb_change_window_attributes(c, connection_.root(), XCB_CW_EVENT_MASK, &structure);
    // The size that came with the connection may be out of date by the time that changes are told.
    if (const auto size =
            connection_.await<xcb_get_geometry_reply_t>(xcb_get_geometry(c, connection_.root()))) {
        screenWidth_ = size->width;
        screenHeight_ = size->height;
    }
    damage_ = xcb_generate_id(c);
    xcb_damage_create(c, damage_, connection_.root(), XCB_DAMAGE_REPORT_LEVEL_NON_EMPTY);
    watchPointer();
    return true;
}

/// The cursor's shape is told by XFIXES; that it moved only by raw input events, since the core protocol
/// tells motion to the window below it alone.
void RootPicture::watchPointer() {
    xcb_connection_t* const c = connection_.raw();
    cursorEvent_ = static_cast<std::uint8_t>(xcb_get_extension_data(c, &xcb_xfixes_id)->first_event +
                                             XCB_XFIXES_CURSOR_NOTIFY);
    xcb_xfixes_select_cursor_input(c, connection_.root(), XCB_XFIXES_CURSOR_NOTIFY_MASK_DISPLAY_CURSOR);
    if (!connection_.hasExtension(xcb_input_id)) return;
    inputOpcode_ = xcb_get_extension_data(c, &xcb_input_id)->major_opcode;
    connection_.await<xcb_input_xi_query_version_reply_t>(xcb_input_xi_query_version(c, 2, 0));
    const struct {
        xcb_input_event_mask_t head;
        std::uint32_t mask;
    } events{{XCB_INPUT_DEVICE_ALL_MASTER, 1}, XCB_INPUT_XI_EVENT_MASK_RAW_MOTION};
    xcb_input_xi_select_events(c, connection_.root(), 1, &events.head);
}

bool RootPicture::handle(const xcb_generic_event_t& event) {
    const auto type = static_cast<std::uint8_t>(event.response_type & 0x7F);
    if (type == damageEvent_ || type == cursorEvent_) return true;
    if (type == XCB_GE_GENERIC) {
        const auto& generic = reinterpret_cast<const xcb_ge_generic_event_t&>(event);
        return generic.extension == inputOpcode_ && generic.event_type == XCB_INPUT_RAW_MOTION;
    }
    if (type != XCB_CONFIGURE_NOTIFY) return false;
    const auto& configured = reinterpret_cast<const xcb_configure_notify_event_t&>(event);
    if (configured.window != connection_.root()) return false;
    screenWidth_ = configured.width;
    screenHeight_ = configured.height;
    return true;
}

unsigned RootPicture::rearm() {
    return xcb_damage_subtract(connection_.raw(), damage_, XCB_NONE, XCB_NONE).sequence;
}

VideoSurface::Geometry RootPicture::refresh() {
    const Size screen{static_cast<double>(screenWidth_), static_cast<double>(screenHeight_)};
    scale_ = scaleToFit(screen, turnedLike(screen, limit_));
    const std::uint16_t width = scaledSide(screenWidth_, scale_);
    const std::uint16_t height = scaledSide(screenHeight_, scale_);
    if (scale_ == 1) {
        canvas_.reset();
    } else if (!canvas_ || canvas_->width() != width || canvas_->height() != height) {
        canvas_ = std::make_unique<XCanvas>(connection_, render_, width, height);
        if (screenPicture_ != 0) xcb_render_free_picture(connection_.raw(), screenPicture_);
        screenPicture_ = render_.makePicture(connection_.root(), connection_.screen().root_depth, scale_);
    }
    return VideoSurface::Geometry::packed(width, height);
}

bool RootPicture::grab(const ShmTarget& target) {
    // Asked for together, so that both cost one round trip.
    const auto cursorAsked = xcb_xfixes_get_cursor_image(connection_.raw());
    const bool grabbed = grabScreen(target);
    const auto cursor = connection_.await<xcb_xfixes_get_cursor_image_reply_t>(cursorAsked);
    if (grabbed && cursor) drawCursor(target, *cursor);
    return grabbed;
}

bool RootPicture::grabScreen(const ShmTarget& target) {
    const VideoSurface::Geometry& frame = target.surface.geometry();
    xcb_drawable_t source = connection_.root();
    if (canvas_) {
        canvas_->draw(screenPicture_, false, scale_, {0, 0, screenWidth_, screenHeight_}, 0, 0);
        source = canvas_->pixmap();
    }
    return connection_.await<xcb_shm_get_image_reply_t>(
               xcb_shm_get_image(connection_.raw(), source, 0, 0, static_cast<std::uint16_t>(frame.width),
                                 static_cast<std::uint16_t>(frame.height), kAllPlanes,
                                 XCB_IMAGE_FORMAT_Z_PIXMAP, target.segment, 0)) != nullptr;
}

void RootPicture::drawCursor(const ShmTarget& target,
                             const xcb_xfixes_get_cursor_image_reply_t& cursor) const {
    const int pixelCount = xcb_xfixes_get_cursor_image_cursor_image_length(&cursor);
    const CursorImage image{cursor.x - cursor.xhot,
                            cursor.y - cursor.yhot,
                            cursor.width,
                            cursor.height,
                            {xcb_xfixes_get_cursor_image_cursor_image(&cursor),
                             static_cast<std::size_t>(std::max(pixelCount, 0))}};
    blendCursor(image, scale_, target.surface.geometry(), target.surface.writablePixels());
}

}  // namespace kelvo::x11
