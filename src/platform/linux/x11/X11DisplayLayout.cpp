#include "platform/linux/x11/X11DisplayLayout.h"

#include "platform/linux/x11/DesktopWatch.h"

#include <algorithm>
#include <vector>

namespace kelvo::x11 {
namespace {

constexpr int kDesktopLevel = 0;
constexpr int kApplicationLevel = 1;

DisplayLayout layoutOf(const DesktopView& view) {
    DisplayLayout layout;
    for (std::size_t i = 0; i < view.sharing; ++i)
        layout.elements.push_back({kApplicationLevel});
    if (layout.elements.empty()) layout.elements.push_back({kDesktopLevel});
    return layout;
}

class Monitor : public DisplayLayoutMonitor {
  public:
    explicit Monitor(const std::string& display) : watch_(display) {
        const auto connection = XConnection::open(display);
        auto reader = connection ? DesktopReader::open(*connection) : std::nullopt;
        const auto view = reader ? reader->read() : std::nullopt;
        layout_.set(layoutOf(view.value_or(DesktopView())));
        watch_.setHandler([this](const DesktopView& seen) { viewChanged(seen); });
    }

    DisplayLayout currentLayout() override { return layout_.copy(); }
    void addObserver(std::weak_ptr<DisplayLayoutObserver> observer) override {
        observers_.with([&](auto& observers) { observers.push_back(std::move(observer)); });
    }
    void removeObserver(const DisplayLayoutObserver* observer) override {
        observers_.with([&](auto& observers) {
            std::erase_if(observers, [&](const auto& known) {
                const auto alive = known.lock();
                return !alive || alive.get() == observer;
            });
        });
    }
    void invalidate() override {
        observers_.set({});
        watch_.setHandler(nullptr);
    }

  private:
    void viewChanged(const DesktopView& view) {
        const DisplayLayout layout = layoutOf(view);
        const DisplayLayout before = layout_.exchange(layout);
        const bool isSame =
            std::ranges::equal(before.elements, layout.elements, {}, &DisplayLayout::Element::level,
                               &DisplayLayout::Element::level);
        if (isSame) return;
        for (const auto& known : observers_.copy()) {
            if (const auto observer = known.lock())
                observer->layoutMonitorDidUpdateDisplayLayout(*this, layout);
        }
    }

    Guarded<DisplayLayout> layout_;
    Guarded<std::vector<std::weak_ptr<DisplayLayoutObserver>>> observers_;
    DesktopWatch watch_;  // ends before what its handler uses
};

}  // namespace

std::shared_ptr<DisplayLayoutMonitor> X11DisplayLayout::createMonitor(int) {
    return std::make_shared<Monitor>(display_);
}

}  // namespace kelvo::x11
