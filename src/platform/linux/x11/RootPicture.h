#pragma once

#include "base/Geometry.h"
#include "platform/linux/x11/XPicture.h"
#include "platform/linux/x11/XRender.h"

#include <memory>
#include <xcb/damage.h>
#include <xcb/xfixes.h>

namespace kelvo::x11 {

/// The whole screen with the cursor on it. Follows the screen's resolution and rotation: the root window
/// always lies upright, so a rotated screen is a picture of another shape and never one on its side.
class RootPicture : public XPicture {
  public:
    RootPicture(XConnection& connection, const Size& limit) : connection_(connection), limit_(limit) {}

    bool watch() override;
    bool handle(const xcb_generic_event_t& event) override;
    unsigned rearm() override;
    VideoSurface::Geometry refresh() override;
    bool grab(const ShmTarget& target) override;

  private:
    void watchPointer();
    bool grabScreen(const ShmTarget& target);
    void drawCursor(const ShmTarget& target, const xcb_xfixes_get_cursor_image_reply_t& cursor) const;

    XConnection& connection_;
    const Size limit_;
    XRender render_;
    xcb_damage_damage_t damage_ = 0;
    std::uint8_t damageEvent_ = 0;
    std::uint8_t cursorEvent_ = 0;
    std::uint8_t inputOpcode_ = 0;
    std::uint16_t screenWidth_ = 0;
    std::uint16_t screenHeight_ = 0;
    double scale_ = 1;
    std::unique_ptr<XCanvas> canvas_;  ///< when the screen must be scaled
    xcb_render_picture_t screenPicture_ = 0;
};

}  // namespace kelvo::x11
