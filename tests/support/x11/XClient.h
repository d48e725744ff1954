#pragma once

#include "base/VideoSurface.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <xcb/xcb.h>

namespace kelvo::test {

/// A program that draws on an X display, played by a test. Every call has taken effect on the server when it
/// returns. One thread at a time.
class XClient {
  public:
    explicit XClient(const std::string& display);
    ~XClient();
    XClient(const XClient&) = delete;
    XClient& operator=(const XClient&) = delete;

    xcb_connection_t* raw() const { return connection_; }
    xcb_window_t root() const { return screen_->root; }
    int screenWidth() const { return screen_->width_in_pixels; }
    int screenHeight() const { return screen_->height_in_pixels; }

    struct Place {
        int x = 0;
        int y = 0;
        int width = 0;
        int height = 0;
    };

    /// A mapped window of one colour (0xRRGGBB), outside a window manager's reach unless `isManaged`. With
    /// `hasAlpha` it has a fourth colour channel, its highest byte.
    xcb_window_t createWindow(const Place& place, std::uint32_t colour, bool isManaged = false,
                              bool hasAlpha = false);
    void place(xcb_window_t window, const Place& place);
    void raise(xcb_window_t window);
    void map(xcb_window_t window);
    void unmap(xcb_window_t window);
    void destroy(xcb_window_t window);
    void reparent(xcb_window_t window, xcb_window_t parent, int x, int y);

    /// Draws the numbered picture over the whole window, in one stroke.
    void showNumber(xcb_window_t window, std::uint32_t number);
    void fill(xcb_window_t window, const Place& place, std::uint32_t colour);
    void movePointer(int x, int y);
    /// Gives the screen another size, by a new mode. No side may be longer than the server began with.
    bool resizeScreen(int width, int height);

    void sync();

  private:
    struct Extent {
        std::uint16_t width;
        std::uint16_t height;
        std::uint8_t depth;
    };
    Extent extentOf(xcb_window_t window);
    xcb_gcontext_t makeContext(xcb_drawable_t drawable);

    xcb_connection_t* const connection_;
    const xcb_screen_t* const screen_;
};

}  // namespace kelvo::test
