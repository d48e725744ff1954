#include "platform/simulated/SimulatedScreen.h"

#include "platform/simulated/SimulatedScreenSource.h"

#include <cmath>

namespace kelvo {

std::shared_ptr<ScreenCaptureSource> SimulatedScreen::createSource(const Size& size,
                                                                   const MediaTime& minimumFrameInterval) {
    const std::chrono::nanoseconds interval(std::llround(minimumFrameInterval.seconds() * 1e9));
    auto source = std::make_shared<SimulatedScreenSource>(*this, size, interval);
    sources_.with([&](Sources& sources) {
        std::erase_if(sources, [](const auto& known) { return known.expired(); });
        sources.push_back(source);
    });
    return source;
}

template <typename Action>
void SimulatedScreen::forEachSource(Action action) {
    for (const auto& weak : sources_.copy()) {
        if (const auto source = weak.lock()) action(*source);
    }
}

template <typename Change>
void SimulatedScreen::changePicture(Change change) {
    const auto now = clock_->monotonicNow();
    picture_.with([&](Picture& picture) {
        change(picture);
        ++picture.change;
        picture.changedAt = now;
    });
    catchUp();
}

void SimulatedScreen::catchUp() {
    forEachSource([](SimulatedScreenSource& source) { source.catchUp(); });
}

void SimulatedScreen::setMode(MirroringMode mode) {
    if (picture().mode != mode) changePicture([&](Picture& picture) { picture.mode = mode; });
}

void SimulatedScreen::setCloneContexts(std::set<std::uint32_t> contextIDs) {
    contexts_.set(std::move(contextIDs));
    changePicture([](Picture&) {});
}

void SimulatedScreen::show(std::uint32_t number) {
    changePicture([&](Picture& picture) { picture.number = number; });
}

void SimulatedScreen::resize(const Size& size) {
    changePicture([&](Picture& picture) { picture.size = size; });
}

void SimulatedScreen::setTransform(const ScreenTransform& transform) {
    changePicture([&](Picture& picture) { picture.transform = transform; });
}

void SimulatedScreen::fail(ScreenCaptureStatus status) {
    forEachSource([&](SimulatedScreenSource& each) {
        each.report(
            [&](auto& source, auto& delegate) {
                delegate.screenCaptureControllerDidFailWithStatus(source, status);
            },
            true);
    });
}

void SimulatedScreen::preempt() {
    forEachSource([](SimulatedScreenSource& each) {
        each.report(
            [](auto& source, auto& delegate) { delegate.screenCaptureControllerWasPreempted(source); },
            false);
    });
}

void SimulatedScreen::resetMediaServices() {
    forEachSource([](SimulatedScreenSource& each) {
        each.report([](auto& source,
                       auto& delegate) { delegate.screenCaptureControllerMediaServicesWereReset(source); },
                    false);
    });
}

}  // namespace kelvo
