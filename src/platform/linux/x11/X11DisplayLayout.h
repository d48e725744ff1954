#pragma once

#include "platform/DisplayLayout.h"

#include <memory>
#include <string>

namespace kelvo::x11 {

/// The layout of an X display: one element of level 1 for each application that shares the screen with others
/// side by side, and one alone when they lie above each other as on any desktop. An empty desktop is one
/// element of level 0, and so is a display that cannot be reached. Thread-safe.
class X11DisplayLayout : public DisplayLayoutService {
  public:
    explicit X11DisplayLayout(std::string display) : display_(std::move(display)) {}

    /// Every display type is the one display. The monitor watches it from now on until it is invalidated or
    /// goes, on a thread of its own, on which its observers are told.
    std::shared_ptr<DisplayLayoutMonitor> createMonitor(int displayType) override;

  private:
    const std::string display_;
};

}  // namespace kelvo::x11
