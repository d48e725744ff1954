#pragma once

#include "base/Geometry.h"
#include "platform/linux/x11/TrackedWindow.h"
#include "platform/linux/x11/XPicture.h"

#include <cstdint>
#include <memory>
#include <set>
#include <vector>

namespace kelvo::x11 {

/// A set of windows, put together on a canvas of their own: nothing else that is on the screen shows, be it
/// above them, below them or around them.
class WindowsPicture : public XPicture {
  public:
    WindowsPicture(XConnection& connection, const Size& size, std::set<std::uint32_t> windows)
        : connection_(connection), size_(size), wanted_(std::move(windows)) {}

    bool watch() override;
    bool handle(const xcb_generic_event_t& event) override;
    unsigned rearm() override;
    VideoSurface::Geometry refresh() override;
    bool grab(const ShmTarget& target) override;

  private:
    void sortByStacking();
    const TrackedWindow* anchor() const;
    void compose();

    XConnection& connection_;
    const Size size_;
    const std::set<std::uint32_t> wanted_;
    XRender render_;
    std::unique_ptr<XCanvas> canvas_;
    std::vector<std::unique_ptr<TrackedWindow>> windows_;  ///< from the bottom to the top
    std::uint8_t damageEvent_ = 0;
    bool structureChanged_ = true;
};

}  // namespace kelvo::x11
