#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace kelvo::x11 {

/// One process with windows on the desktop, or one that had some and still runs.
struct DesktopApplication {
    std::int32_t processIdentifier = 0;
    bool isVisible = false;  ///< a window of it is on the screen, covered or not
    bool isActive = false;   ///< it has the user's input

    friend bool operator==(const DesktopApplication&, const DesktopApplication&) = default;
};

/// What a desktop shows at one moment.
struct DesktopView {
    std::vector<DesktopApplication> applications;  ///< by process identifier
    /// How many applications share the screen, side by side; 1 when one has it to itself, be it with others
    /// floating above or below it, and 0 when none is visible.
    std::size_t sharing = 0;

    friend bool operator==(const DesktopView&, const DesktopView&) = default;
};

/// The place of one visible application window, in pixels.
struct DesktopWindow {
    std::int32_t processIdentifier = 0;
    int x = 0;
    int y = 0;
    int width = 0;
    int height = 0;
    bool isActive = false;
};

/// The space that windows may fill.
struct DesktopArea {
    int width = 0;
    int height = 0;
};

/// How many processes share the area: the active window (else the topmost) and those of others that stand
/// beside it without overlap, each as high or as wide as the area but for a frame, when all together fill it.
/// `windows` go from the bottom to the top.
std::size_t countSharing(const std::vector<DesktopWindow>& windows, const DesktopArea& area);

}  // namespace kelvo::x11
