#pragma once

#include "platform/linux/x11/XConnection.h"

#include <cstdint>
#include <xcb/render.h>

namespace kelvo::x11 {

/// A rectangle of a drawable, in its own pixels.
struct SourceArea {
    std::int16_t x = 0;
    std::int16_t y = 0;
    std::uint16_t width = 0;
    std::uint16_t height = 0;
};

/// Draws pictures of the server's on each other, on the server. Belongs to its connection's thread.
class XRender {
  public:
    /// False when the display has no RENDER or none of the two pixel formats.
    bool begin(XConnection& connection);

    /// The format of drawables of this depth; none (0) for depths that screens do not have.
    xcb_render_pictformat_t formatOfDepth(std::uint8_t depth) const;

    /// A view of a drawable, to be drawn scaled by `scale`. Of a window it includes the windows within.
    xcb_render_picture_t makePicture(xcb_drawable_t drawable, std::uint8_t depth, double scale);

  private:
    XConnection* connection_ = nullptr;
    xcb_render_pictformat_t opaque_ = 0;
    xcb_render_pictformat_t withAlpha_ = 0;
};

/// A pixmap as large as a frame, on which the frame is put together.
class XCanvas {
  public:
    XCanvas(XConnection& connection, XRender& render, std::uint16_t width, std::uint16_t height);
    ~XCanvas();
    XCanvas(const XCanvas&) = delete;
    XCanvas& operator=(const XCanvas&) = delete;

    void fillBlack();
    /// Draws `area` of `picture`, which was made with `scale`, with its corner at (x, y) of the canvas.
    void draw(xcb_render_picture_t picture, bool hasAlpha, double scale, const SourceArea& area, int x,
              int y);

    xcb_pixmap_t pixmap() const { return pixmap_; }
    std::uint16_t width() const { return width_; }
    std::uint16_t height() const { return height_; }

  private:
    XConnection& connection_;
    const std::uint16_t width_;
    const std::uint16_t height_;
    const xcb_pixmap_t pixmap_;
    xcb_render_picture_t picture_;
};

}  // namespace kelvo::x11
