#include "Picture.h"

#include "Chimes.h"

#include <X11/Xatom.h>
#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <numbers>
#include <vector>

namespace scene {
namespace {

struct Hills {
    double height;  ///< of the screen, from below
    double speed;   ///< widths of the screen a second
    double waves;
    std::array<unsigned, 3> colour;
};
constexpr std::array<Hills, 4> kHills{{{0.46, 0.02, 1.3, {92, 62, 112}},
                                       {0.36, 0.05, 1.9, {66, 48, 100}},
                                       {0.25, 0.10, 1.4, {42, 36, 82}},
                                       {0.14, 0.20, 2.2, {20, 22, 56}}}};
constexpr int kStars = 90;
constexpr int kTrail = 14;
/// Segments that are lit, from the top clockwise, the middle one last.
constexpr std::array<unsigned, 10> kDigits{0x3f, 0x06, 0x5b, 0x4f, 0x66, 0x6d, 0x7d, 0x07, 0x7f, 0x6f};

double wave(double turns) {
    return std::sin(2 * std::numbers::pi * turns);
}

/// The same scattered number for the same seed, 0 to 1.
double scattered(unsigned seed) {
    seed = (seed ^ 61U) ^ (seed >> 16U);
    seed *= 9U;
    seed ^= seed >> 4U;
    seed *= 0x27d4eb2dU;
    return (seed ^ (seed >> 15U)) % 10000U / 10000.0;
}

unsigned blend(unsigned from, unsigned to, double part) {
    return static_cast<unsigned>(from + (static_cast<double>(to) - from) * part);
}

}  // namespace

Picture::Picture(Display* display)
    : display_(display),
      width_(DisplayWidth(display, DefaultScreen(display))),
      height_(DisplayHeight(display, DefaultScreen(display))) {
    const Window root = DefaultRootWindow(display_);
    const auto width = static_cast<unsigned>(width_);
    const auto height = static_cast<unsigned>(height_);
    const auto depth = static_cast<unsigned>(DefaultDepth(display_, DefaultScreen(display_)));
    window_ = XCreateSimpleWindow(display_, root, 0, 0, width, height, 0, 0, 0);
    XStoreName(display_, window_, "Moving scene");
    const Atom fullscreen = XInternAtom(display_, "_NET_WM_STATE_FULLSCREEN", False);
    XChangeProperty(display_, window_, XInternAtom(display_, "_NET_WM_STATE", False), XA_ATOM, 32,
                    PropModeReplace, reinterpret_cast<const unsigned char*>(&fullscreen), 1);
    canvas_ = XCreatePixmap(display_, root, width, height, depth);
    sky_ = XCreatePixmap(display_, root, width, height, depth);
    pen_ = XCreateGC(display_, canvas_, 0, nullptr);
    prepareSky();
    XMapRaised(display_, window_);
}

void Picture::setColour(unsigned red, unsigned green, unsigned blue) {
    XSetForeground(display_, pen_, red << 16U | green << 8U | blue);
}

void Picture::fillCircle(double x, double y, double radius) {
    const auto size = static_cast<unsigned>(2 * radius);
    XFillArc(display_, canvas_, pen_, static_cast<int>(x - radius), static_cast<int>(y - radius), size, size,
             0, 360 * 64);
}

void Picture::prepareSky() {
    for (int y = 0; y < height_; ++y) {
        const double part = std::pow(static_cast<double>(y) / height_, 0.8);
        setColour(blend(16, 255, part), blend(18, 150, part), blend(54, 110, part * 0.8));
        XFillRectangle(display_, canvas_, pen_, 0, y, static_cast<unsigned>(width_), 1);
    }
    for (int ring = 12; ring >= 0; --ring) {  // the sun and its glow
        const double part = 1 - ring / 13.0;
        setColour(blend(176, 255, part), blend(96, 222, part * part), blend(96, 140, part));
        fillCircle(width_ * 0.68, height_ * 0.5, width_ * (0.13 + 0.012 * ring));
    }
    XCopyArea(display_, canvas_, sky_, pen_, 0, 0, static_cast<unsigned>(width_),
              static_cast<unsigned>(height_), 0, 0);
}

void Picture::drawStars(double time) {
    for (unsigned star = 0; star < kStars; ++star) {
        const double y = scattered(3 * star + 1) * 0.35;
        const double light = (0.6 + 0.4 * wave(time * 0.4 + scattered(3 * star + 2))) * (1 - y / 0.35);
        setColour(blend(30, 255, light), blend(30, 250, light), blend(70, 235, light));
        fillCircle(scattered(3 * star) * width_, y * height_, width_ * (0.0015 + 0.0015 * light));
    }
}

void Picture::drawHills(double time) {
    for (const Hills& hills : kHills) {
        std::vector<XPoint> outline;
        for (int x = 0; x <= width_ + 8; x += 8) {
            const double at =
                static_cast<double>(x) / width_ * hills.waves + time * hills.speed * hills.waves;
            const double top = hills.height + 0.035 * wave(at) + 0.015 * wave(at * 2.7 + 0.3);
            outline.push_back({static_cast<short>(x), static_cast<short>(height_ * (1 - top))});
        }
        outline.push_back({static_cast<short>(width_ + 8), static_cast<short>(height_)});
        outline.push_back({0, static_cast<short>(height_)});
        setColour(hills.colour[0], hills.colour[1], hills.colour[2]);
        XFillPolygon(display_, canvas_, pen_, outline.data(), static_cast<int>(outline.size()), Complex,
                     CoordModeOrigin);
    }
}

void Picture::drawBall(double time) {
    for (int step = kTrail; step >= 0; --step) {
        const double then = std::max(0.0, time - step * 0.02);
        const double phase = std::fmod(then, kBouncePeriod) / kBouncePeriod;
        const double x = width_ * (0.5 + 0.36 * wave(then / 7.3));
        const double y = height_ * (0.9 - 0.42 * 4 * phase * (1 - phase));
        const double part = 1 - static_cast<double>(step) / (kTrail + 1);
        setColour(blend(40, 255, part), blend(30, 196, part * part), blend(80, 64, part));
        fillCircle(x, y, width_ * 0.045 * (0.35 + 0.65 * part));
    }
}

void Picture::drawDigit(int digit, int x, int y, int size) {
    const int thick = std::max(2, size / 7);
    const int half = size;
    struct Segment {
        int x, y, width, height;
    };
    const std::array<Segment, 7> segments{{{0, 0, size, thick},
                                           {size - thick, 0, thick, half},
                                           {size - thick, half, thick, half},
                                           {0, 2 * half - thick, size, thick},
                                           {0, half, thick, half},
                                           {0, 0, thick, half},
                                           {0, half - thick / 2, size, thick}}};
    for (std::size_t i = 0; i < segments.size(); ++i) {
        if ((kDigits[static_cast<std::size_t>(digit)] >> i & 1U) == 0) continue;
        XFillRectangle(display_, canvas_, pen_, x + segments[i].x, y + segments[i].y,
                       static_cast<unsigned>(segments[i].width), static_cast<unsigned>(segments[i].height));
    }
}

/// Seconds and hundredths, so that two pictures of a recording are never the same.
void Picture::drawClock(double time) {
    const auto hundredths = static_cast<std::int64_t>(time * 100);
    const int size = width_ / 14;
    const int step = size * 3 / 2;
    const int left = (width_ - 4 * step - size) / 2;
    const int top = height_ / 12;
    setColour(255, 238, 214);
    for (int place = 0; place < 4; ++place) {
        constexpr std::array<std::int64_t, 4> divisors{1000, 100, 10, 1};
        const auto digit = static_cast<int>(hundredths / divisors[static_cast<std::size_t>(place)] % 10);
        drawDigit(digit, left + place * step + (place > 1 ? size : 0), top, size);
    }
    fillCircle(left + 2.0 * step + size * 0.25, top + 1.9 * size, size * 0.1);
}

void Picture::draw(double time) {
    XCopyArea(display_, sky_, canvas_, pen_, 0, 0, static_cast<unsigned>(width_),
              static_cast<unsigned>(height_), 0, 0);
    drawStars(time);
    drawHills(time);
    drawBall(time);
    drawClock(time);
    XCopyArea(display_, canvas_, window_, pen_, 0, 0, static_cast<unsigned>(width_),
              static_cast<unsigned>(height_), 0, 0);
    XSync(display_, False);
}

}  // namespace scene
