#pragma once

#include "platform/linux/x11/XConnection.h"
#include "platform/linux/x11/XRender.h"

#include <cstddef>
#include <cstdint>
#include <vector>
#include <xcb/composite.h>
#include <xcb/damage.h>

namespace kelvo::x11 {

/// One window that is recorded, whatever covers it: redirected into storage of its own and watched for
/// drawing, moves and its end. Belongs to its connection's thread.
class TrackedWindow {
  public:
    TrackedWindow(XConnection& connection, XRender& render, xcb_window_t window);
    ~TrackedWindow();
    TrackedWindow(const TrackedWindow&) = delete;
    TrackedWindow& operator=(const TrackedWindow&) = delete;

    /// Looks again at where and how large the window is, and takes hold of its storage when that is another
    /// than before. False when the window no longer exists.
    bool refresh();

    /// The storage may be another from now on: something in the hierarchy was mapped, unmapped or moved to
    /// another parent.
    void forgetStorage() { hasStorage_ = false; }

    /// Whether the window is on the screen (covered or not) and has storage to draw from.
    bool isViewable() const { return isViewable_; }
    xcb_window_t id() const { return window_; }
    /// The window at the top of its hierarchy, below the root: the one that is stacked against others.
    xcb_window_t topLevel() const { return ancestors_.empty() ? window_ : ancestors_.back(); }
    /// Where the corner of the window's inside is on the screen.
    int x() const { return x_; }
    int y() const { return y_; }
    std::uint16_t width() const { return width_; }
    std::uint16_t height() const { return height_; }

    /// Draws the window, scaled, with its corner at (x, y) of the canvas.
    void drawOn(XCanvas& canvas, double scale, int x, int y);

    /// Asks to be told of the next drawing; the request's sequence number.
    unsigned rearm() const;

  private:
    void watchAncestors();
    void nameStorage(std::uint16_t borderWidth);
    void dropStorage();

    XConnection& connection_;
    XRender& render_;
    const xcb_window_t window_;
    const xcb_damage_damage_t damage_;
    std::vector<xcb_window_t> ancestors_;  ///< from the parent up, without the root
    bool isViewable_ = false;
    bool hasStorage_ = false;
    int x_ = 0;
    int y_ = 0;
    std::uint16_t width_ = 0;
    std::uint16_t height_ = 0;
    std::uint16_t borderWidth_ = 0;
    std::uint8_t depth_ = 0;
    xcb_pixmap_t storage_ = 0;
    xcb_render_picture_t picture_ = 0;
    double pictureScale_ = 0;
};

}  // namespace kelvo::x11
