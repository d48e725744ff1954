#include "platform/linux/ipc/FrameLaneSender.h"

#include <algorithm>
#include <utility>

namespace kelvo {

/// Forgets in the order in which the client does.
void FrameLaneSender::sentInMessage(const VideoSurface& surface, Moment now) {
    std::erase_if(known_, [&](const Known& each) { return each.file == surface.file(); });
    if (known_.size() == SurfaceCache::kMostSurfaces)
        known_.erase(std::ranges::min_element(known_, {}, &Known::lastSent));
    known_.push_back({surface.file(), surface.geometry(), now});
}

bool FrameLaneSender::put(std::uint32_t serial, const IPCFrame& frame, Moment now) {
    const std::size_t place = count_ % FrameLane::kPlaces;
    if (frame.record.size() > FrameLane::kMostBytes || loans_[place].surface) return false;
    const VideoSurface& surface = *frame.surface;
    const auto known = std::ranges::find(known_, surface.file(), &Known::file);
    if (known == known_.end() || known->geometry != surface.geometry() || now - known->lastSent >= kPatience)
        return false;
    known->lastSent = now;
    loans_[place] = {serial, frame.surface};
    ++lentCount_;
    FrameLane::Entry entry;
    entry.serial = serial;
    entry.method = static_cast<std::uint32_t>(frame.method);
    entry.surface = surface.file();
    entry.size = static_cast<std::uint32_t>(frame.record.size());
    std::ranges::copy(frame.record, entry.bytes.begin());
    lane_.put(count_++, entry);
    return true;
}

void FrameLaneSender::takeGivenBack(LentSurfaces& gone) {
    // From the latest on: usually that is the only one.
    std::size_t left = lentCount_;
    for (std::uint32_t number = count_ - 1; left > 0; --number) {
        const std::size_t place = number % FrameLane::kPlaces;
        if (!loans_[place].surface) continue;
        --left;
        if (lane_.isGivenBack(place, loans_[place].serial)) takeBack(place, gone);
    }
}

void FrameLaneSender::takeGivenBack(std::uint32_t serial, LentSurfaces& gone) {
    const auto loan = std::ranges::find(loans_, serial, &Loan::serial);
    if (loan != loans_.end() && loan->surface)
        takeBack(static_cast<std::size_t>(loan - loans_.begin()), gone);
}

void FrameLaneSender::takeBack(std::size_t place, LentSurfaces& gone) {
    gone.push_back(std::exchange(loans_[place].surface, nullptr));
    --lentCount_;
}

}  // namespace kelvo
