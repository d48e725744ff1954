#pragma once

#include <X11/Xlib.h>

namespace scene {

/// Hills at dusk that drift by, stars, a bouncing ball and a clock, drawn over the whole screen.
class Picture {
  public:
    /// Opens a window on `display`, which outlives the picture.
    explicit Picture(Display* display);

    /// Shows the picture of `time`, in seconds.
    void draw(double time);

  private:
    void prepareSky();
    void drawStars(double time);
    void drawHills(double time);
    void drawBall(double time);
    void drawClock(double time);
    void drawDigit(int digit, int x, int y, int size);
    void setColour(unsigned red, unsigned green, unsigned blue);
    void fillCircle(double x, double y, double radius);

    Display* const display_;
    const int width_;
    const int height_;
    Window window_ = 0;
    Pixmap canvas_ = 0;
    Pixmap sky_ = 0;
    GC pen_ = nullptr;
};

}  // namespace scene
