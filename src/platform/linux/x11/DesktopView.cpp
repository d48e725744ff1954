#include "platform/linux/x11/DesktopView.h"

#include <algorithm>
#include <set>

namespace kelvo::x11 {
namespace {

/// Frames and gaps between windows take the rest.
constexpr double kFull = 0.85;
constexpr double kTouching = 0.02;

double surface(const DesktopWindow& window) {
    return static_cast<double>(window.width) * window.height;
}

bool isTile(const DesktopWindow& window, const DesktopArea& area) {
    const bool isHigh = window.height >= kFull * area.height;
    const bool isWide = window.width >= kFull * area.width;
    return isHigh != isWide;
}

bool overlap(const DesktopWindow& one, const DesktopWindow& other) {
    const double width = std::min(one.x + one.width, other.x + other.width) - std::max(one.x, other.x);
    const double height = std::min(one.y + one.height, other.y + other.height) - std::max(one.y, other.y);
    if (width <= 0 || height <= 0) return false;
    return width * height > kTouching * std::min(surface(one), surface(other));
}

}  // namespace

std::size_t countSharing(const std::vector<DesktopWindow>& windows, const DesktopArea& area) {
    if (windows.empty()) return 0;
    const auto active = std::ranges::find(windows, true, &DesktopWindow::isActive);
    std::vector<DesktopWindow> tiles{active != windows.end() ? *active : windows.back()};
    if (!isTile(tiles.front(), area)) return 1;
    for (auto window = windows.rbegin(); window != windows.rend(); ++window) {
        const bool isFree =
            std::ranges::none_of(tiles, [&](const auto& tile) { return overlap(tile, *window); });
        if (isFree && isTile(*window, area)) tiles.push_back(*window);
    }
    double filled = 0;
    std::set<std::int32_t> processes;
    for (const DesktopWindow& tile : tiles) {
        filled += surface(tile);
        processes.insert(tile.processIdentifier);
    }
    return filled >= kFull * area.width * area.height ? processes.size() : 1;
}

}  // namespace kelvo::x11
