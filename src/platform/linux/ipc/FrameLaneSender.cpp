#include "platform/linux/ipc/FrameLaneSender.h"

#include <algorithm>
#include <utility>

namespace kelvo {

const FrameLaneSender::Known* FrameLaneSender::find(const VideoSurface& surface) const {
    const auto found = std::ranges::find(known_, surface.file(), &Known::file);
    return found == known_.end() ? nullptr : &*found;
}

/// Forgets in the order in which the client does.
void FrameLaneSender::sentInMessage(const VideoSurface& surface, Moment now) {
    std::erase_if(known_, [&](const Known& each) { return each.file == surface.file(); });
    if (known_.size() == SurfaceCache::kMostSurfaces)
        known_.erase(std::ranges::min_element(known_, {}, &Known::lastSent));
    known_.push_back({surface.file(), surface.geometry(), now});
}

bool FrameLaneSender::takes(const VideoSurface& surface, std::span<const std::byte> bytes, Moment now) const {
    if (bytes.size() > FrameLane::kMostBytes || loans_[count_ % FrameLane::kPlaces].surface) return false;
    const Known* known = find(surface);
    return known != nullptr && known->geometry == surface.geometry() && now - known->lastSent < kPatience;
}

void FrameLaneSender::put(std::uint32_t serial, std::size_t method, std::shared_ptr<VideoSurface> surface,
                          std::span<const std::byte> bytes, Moment now) {
    FrameLane::Entry entry;
    entry.serial = serial;
    entry.method = static_cast<std::uint32_t>(method);
    entry.surface = surface->file();
    entry.size = static_cast<std::uint32_t>(bytes.size());
    std::ranges::copy(bytes, entry.bytes.begin());
    std::ranges::find(known_, surface->file(), &Known::file)->lastSent = now;
    loans_[count_ % FrameLane::kPlaces] = {serial, std::move(surface)};
    lane_.put(count_++, entry);
}

void FrameLaneSender::takeGivenBack(LentSurfaces& gone) {
    for (std::size_t place = 0; place < loans_.size(); ++place) {
        Loan& loan = loans_[place];
        if (loan.surface && lane_.isGivenBack(place, loan.serial))
            gone.push_back(std::exchange(loan.surface, nullptr));
    }
}

void FrameLaneSender::takeGivenBack(std::uint32_t serial, LentSurfaces& gone) {
    for (Loan& loan : loans_) {
        if (loan.surface && loan.serial == serial) gone.push_back(std::exchange(loan.surface, nullptr));
    }
}

std::size_t FrameLaneSender::lentCount() const {
    return static_cast<std::size_t>(
        std::ranges::count_if(loans_, [](const Loan& loan) { return loan.surface != nullptr; }));
}

}  // namespace kelvo
