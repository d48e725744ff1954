#include "base/VideoSurfacePool.h"

#include <utility>

namespace kelvo {

VideoSurfacePool::VideoSurfacePool(const VideoSurface::Geometry& geometry, std::size_t capacity,
                                   Prepare prepare)
    : geometry_(geometry), capacity_(capacity), prepare_(std::move(prepare)) {}

Result<VideoSurfaceRef> VideoSurfacePool::take() {
    VideoSurfaceRef surface = free_->with([](auto& free) {
        // The one that came back last is the likeliest to be in the processor's cache.
        VideoSurfaceRef last = free.empty() ? nullptr : std::move(free.back());
        if (last) free.pop_back();
        return last;
    });
    if (surface) return lend(std::move(surface));
    if (made_ == capacity_) return VideoSurfaceRef();
    auto created = VideoSurface::create(geometry_);
    if (!created) return created;
    if (prepare_) {
        if (auto error = prepare_(**created)) return *error;
    }
    ++made_;
    return lend(std::move(*created));
}

VideoSurfaceRef VideoSurfacePool::lend(VideoSurfaceRef surface) const {
    VideoSurface* const lent = surface.get();
    return VideoSurfaceRef(
        lent, [free = std::weak_ptr<Free>(free_), surface = std::move(surface)](VideoSurface*) mutable {
            if (const auto home = free.lock())
                home->with([&](auto& all) { all.push_back(std::move(surface)); });
        });
}

}  // namespace kelvo
