#pragma once

#include <memory>
#include <vector>

namespace kelvo {

/// What is on a display: one entry an element, with its level (0 and 1 are applications, 2 and more lie
/// above).
struct DisplayLayout {
    struct Element {
        int level = 0;
    };
    std::vector<Element> elements;
};

class DisplayLayoutMonitor;

/// Told about layout changes, on the layout service's queue.
class DisplayLayoutObserver {
  public:
    virtual ~DisplayLayoutObserver() = default;
    virtual void layoutMonitorDidUpdateDisplayLayout(DisplayLayoutMonitor& monitor,
                                                     const DisplayLayout& layout) = 0;
};

/// Watches the layout of one display. Any thread.
class DisplayLayoutMonitor {
  public:
    virtual ~DisplayLayoutMonitor() = default;
    virtual DisplayLayout currentLayout() = 0;
    virtual void addObserver(std::weak_ptr<DisplayLayoutObserver> observer) = 0;
    virtual void removeObserver(const DisplayLayoutObserver* observer) = 0;
    /// No observer is told anything any more.
    virtual void invalidate() = 0;
};

/// Makes layout monitors. Implemented by the X11 adapter and by the simulated device.
class DisplayLayoutService {
  public:
    virtual ~DisplayLayoutService() = default;
    /// `displayType` 0 is the main display.
    virtual std::shared_ptr<DisplayLayoutMonitor> createMonitor(int displayType) = 0;
};

}  // namespace kelvo
