#include "support/x11/XClient.h"

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <thread>

namespace {

using kelvo::test::XClient;

constexpr int kStep = 6;  // pixels that the text moves in a picture
constexpr int kLineHeight = 24;
constexpr XClient::Place kCounter{0, 0, 400, 250};

/// A page of something like text, twice as high as the screen, so that it can be scrolled.
xcb_pixmap_t drawPage(XClient& client, xcb_window_t window, xcb_gcontext_t context) {
    const auto page = xcb_generate_id(client.raw());
    const auto width = static_cast<std::uint16_t>(client.screenWidth());
    const auto height = static_cast<std::uint16_t>(2 * client.screenHeight());
    xcb_create_pixmap(client.raw(), 24, page, window, width, height);
    const auto fill = [&](std::uint32_t colour, const xcb_rectangle_t& area) {
        xcb_change_gc(client.raw(), context, XCB_GC_FOREGROUND, &colour);
        xcb_poly_fill_rectangle(client.raw(), page, context, 1, &area);
    };
    fill(0xf4f1e8, {0, 0, width, height});
    std::uint32_t random = 1;
    for (int y = kLineHeight; y + kLineHeight < height; y += kLineHeight) {
        for (int x = 40; x + 40 < width;) {
            random = random * 1664525U + 1013904223U;
            const auto letter = static_cast<std::uint16_t>(3 + random % 9);
            if (random >> 29 != 0) {
                fill(random & 0x3f3f3f, {static_cast<std::int16_t>(x), static_cast<std::int16_t>(y), letter,
                                         static_cast<std::uint16_t>(8 + (random >> 16) % 8)});
            }
            x += letter + 3;
        }
    }
    client.sync();
    return page;
}

}  // namespace

/// moving_screen DISPLAY PICTURES_A_SECOND MOVING_SHARE: scrolls text over the whole screen, in the first
/// MOVING_SHARE (0 to 1) of each second, and counts the pictures in a corner. Says "ready" and goes on
/// until it is killed.
int main(int argumentCount, char** arguments) {
    if (argumentCount != 4) return 2;
    XClient client(arguments[1]);
    const double rate = std::atof(arguments[2]);
    const double share = std::atof(arguments[3]);
    const auto screen =
        client.createWindow({0, 0, client.screenWidth(), client.screenHeight()}, 0xffffff, true);
    const auto counter = client.createWindow(kCounter, 0);
    // Without a window manager the focus says whose sound is recorded.
    xcb_set_input_focus(client.raw(), XCB_INPUT_FOCUS_PARENT, screen, XCB_CURRENT_TIME);
    const auto context = xcb_generate_id(client.raw());
    xcb_create_gc(client.raw(), context, screen, 0, nullptr);
    const xcb_pixmap_t page = drawPage(client, screen, context);
    std::puts("ready");
    std::fflush(stdout);
    const auto begin = std::chrono::steady_clock::now();
    const std::chrono::duration<double> interval(1 / rate);
    for (std::int64_t tick = 0, shown = 0;; ++tick) {
        const auto due = begin + tick * interval;
        std::this_thread::sleep_until(due);
        const double second = std::chrono::duration<double>(due - begin).count();
        if (second - static_cast<double>(static_cast<std::int64_t>(second)) >= share) continue;
        ++shown;
        const auto offset = static_cast<std::int16_t>(shown * kStep % client.screenHeight());
        xcb_copy_area(client.raw(), page, screen, context, 0, offset, 0, 0,
                      static_cast<std::uint16_t>(client.screenWidth()),
                      static_cast<std::uint16_t>(client.screenHeight()));
        client.showNumber(counter, static_cast<std::uint32_t>(shown));
    }
}
