#include "platform/linux/ipc/SurfaceLending.h"

#include <algorithm>
#include <cerrno>
#include <utility>

namespace kelvo {
namespace {

/// What stands behind a lent surface: goes when the surface's last reference does.
struct Loan {
    VideoSurfaceRef surface;
    std::shared_ptr<void> lease;
};

/// The surface of an argument that may carry one; none for any other.
std::shared_ptr<ObjectHandle> surfaceIn(const IPCArgument& description, const Value& argument) {
    if (description.allowedObjects != IPCObjects::surfaces) return nullptr;
    const Array* array = argument.asArray();
    if (array == nullptr || array->size() != 1) return nullptr;
    const auto* handle = array->front().as<std::shared_ptr<ObjectHandle>>();
    return handle != nullptr ? *handle : nullptr;
}

}  // namespace

LentSurfaces surfacesIn(const std::vector<IPCArgument>& description, const Array& arguments) {
    LentSurfaces surfaces;
    for (std::size_t i = 0; i < std::min(description.size(), arguments.size()); ++i) {
        if (auto surface = surfaceIn(description[i], arguments[i])) surfaces.push_back(std::move(surface));
    }
    return surfaces;
}

VideoSurfaceRef tiedTo(const std::shared_ptr<void>& lease, const VideoSurfaceRef& surface) {
    return {std::make_shared<Loan>(Loan{surface, lease}), surface.get()};
}

bool SurfaceReturns::letGo(std::uint32_t serial, Moment now) {
    waiting_.push_back(serial);
    if (!due_) due_ = now + kPatience;
    return --held_ > 0 || waiting_.size() >= kMostTogether;
}

std::vector<std::uint32_t> SurfaceReturns::take() {
    due_.reset();
    return std::exchange(waiting_, {});
}

Result<VideoSurfaceRef> SurfaceCache::open(UniqueFd descriptor, const VideoSurface::Geometry& geometry,
                                           Moment now) {
    const auto file = VideoSurface::fileOf(descriptor.get());
    if (!file) return KVError::posix(errno, "surface descriptor");
    const auto known = std::ranges::find_if(entries_, [&](const Entry& entry) {
        return entry.surface->file() == *file && entry.surface->geometry() == geometry;
    });
    if (known != entries_.end()) {
        known->lastUse = now;
        return known->surface;
    }
    auto surface = VideoSurface::fromDescriptor(std::move(descriptor), geometry);
    if (!surface) return surface;
    if (entries_.size() == kMostSurfaces)
        entries_.erase(std::ranges::min_element(entries_, {}, &Entry::lastUse));
    entries_.push_back({*surface, now});
    return surface;
}

/// Of a file that was opened as several surfaces it is the one that was used last.
VideoSurfaceRef SurfaceCache::find(const VideoSurface::File& file, Moment now) {
    Entry* latest = nullptr;
    for (Entry& each : entries_) {
        if (each.surface->file() == file && (latest == nullptr || each.lastUse > latest->lastUse))
            latest = &each;
    }
    if (latest == nullptr) return nullptr;
    latest->lastUse = now;
    return latest->surface;
}

void SurfaceCache::dropUnused(Moment now) {
    std::erase_if(entries_, [now](const Entry& entry) { return now - entry.lastUse >= kPatience; });
}

}  // namespace kelvo
