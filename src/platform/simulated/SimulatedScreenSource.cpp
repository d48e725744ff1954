#include "platform/simulated/SimulatedScreenSource.h"

#include "platform/simulated/NumberedPicture.h"

#include <algorithm>
#include <cmath>
#include <utility>

namespace kelvo {
namespace {

constexpr std::size_t kSurfaces = 8;
constexpr std::int32_t kNanoseconds = 1000000000;

VideoSurface::Geometry frameGeometry(const Size& screen, Size limit) {
    if ((screen.width < screen.height) != (limit.width < limit.height)) std::swap(limit.width, limit.height);
    const double scale = scaleToFit(screen, limit);
    return VideoSurface::Geometry::packed(
        static_cast<std::uint32_t>(std::max(1L, std::lround(screen.width * scale))),
        static_cast<std::uint32_t>(std::max(1L, std::lround(screen.height * scale))));
}

}  // namespace

SimulatedScreenSource::SimulatedScreenSource(SimulatedScreen& screen, const Size& size,
                                             std::chrono::nanoseconds interval)
    : screen_(screen), size_(size), interval_(interval) {}

void SimulatedScreenSource::setDelegate(std::weak_ptr<ScreenCaptureDelegate> delegate) {
    delegate_.set(std::move(delegate));
}

void SimulatedScreenSource::onQueue(const Task& task) {
    if (queue_.isCurrent()) {
        task();
    } else {
        queue_.sync(task);
    }
}

void SimulatedScreenSource::startCapture() {
    if (isRunning_) return;
    isFresh_ = true;
    isRunning_ = true;
}

void SimulatedScreenSource::stopCapture() {
    isRunning_ = false;
    onQueue([] {});
}

void SimulatedScreenSource::catchUp() {
    onQueue([this] {
        if (isFresh_.exchange(false)) beginAnew();
        const SimulatedScreen::Picture picture = screen_.picture();
        const bool isNews = picture.change != deliveredChange_ && picture.mode != MirroringMode::off;
        const auto changedAt = std::max(picture.changedAt, startedAt_);
        if (!isRunning_ || !isNews || !takeTurn(changedAt)) return;
        const VideoSurfaceRef surface = draw(picture);
        if (!surface) {
            ++skipped_;
            return;
        }
        deliveredChange_ = picture.change;
        deliver(picture, surface);
    });
}

void SimulatedScreenSource::beginAnew() {
    pacer_.emplace(interval_);
    deliveredChange_ = 0;
    startedAt_ = screen_.clock_->monotonicNow();
}

bool SimulatedScreenSource::takeTurn(std::chrono::nanoseconds changedAt) {
    const auto now = screen_.clock_->monotonicNow();
    const auto due = pacer_->due(changedAt);
    if (due > now) return false;
    pacer_->captured(due, now);
    return true;
}

VideoSurfaceRef SimulatedScreenSource::draw(const SimulatedScreen::Picture& picture) {
    const VideoSurface::Geometry geometry = frameGeometry(picture.size, size_);
    if (!pool_ || pool_->geometry() != geometry)
        pool_.emplace(geometry, kSurfaces, [](VideoSurface& surface) { return surface.seal(); });
    VideoSurfaceRef surface = pool_->take().valueOr(nullptr);
    if (surface) NumberedPicture::draw(picture.number, geometry, surface->writablePixels());
    return surface;
}

void SimulatedScreenSource::deliver(const SimulatedScreen::Picture& picture, VideoSurfaceRef surface) {
    const auto changedAt = std::max(picture.changedAt, startedAt_);
    lastDelivered_ = std::max(changedAt, lastDelivered_ + std::chrono::nanoseconds(1));
    const TimingRecord timing{MediaTime::invalid(), MediaTime::make(lastDelivered_.count(), kNanoseconds),
                              MediaTime::invalid()};
    const auto delegate = delegate_.copy().lock();
    if (!delegate) return;
    delegate->screenCaptureControllerDidReceiveSampleBuffer(
        *this, SampleBuffer::video(std::move(surface), timing), picture.transform);
}

void SimulatedScreenSource::report(const Message& message, bool isLast) {
    onQueue([&] {
        if (!isRunning_) return;
        if (isLast) isRunning_ = false;
        if (const auto delegate = delegate_.copy().lock()) message(*this, *delegate);
    });
}

}  // namespace kelvo
