#include "platform/linux/x11/MirroringState.h"

#include <utility>

namespace kelvo::x11 {

Mirroring MirroringState::current() const {
    return shared_.with([](const Shared& shared) { return shared.mirroring; });
}

void MirroringState::setMode(MirroringMode mode) {
    change([&](Mirroring& mirroring) { mirroring.mode = mode; });
}

void MirroringState::setContexts(std::set<std::uint32_t> contexts) {
    change([&](Mirroring& mirroring) { mirroring.contexts = std::move(contexts); });
}

template <typename Change>
void MirroringState::change(Change apply) {
    const auto toWake = shared_.with([&](Shared& shared) {
        const Mirroring before = shared.mirroring;
        apply(shared.mirroring);
        std::erase_if(shared.listeners, [](const auto& listener) { return listener.expired(); });
        return shared.mirroring == before ? std::vector<std::weak_ptr<WakeEvent>>() : shared.listeners;
    });
    for (const auto& listener : toWake) {
        if (const auto event = listener.lock()) event->set();
    }
}

void MirroringState::addListener(const std::shared_ptr<WakeEvent>& listener) {
    shared_.with([&](Shared& shared) {
        std::erase_if(shared.listeners, [](const auto& known) { return known.expired(); });
        shared.listeners.push_back(listener);
    });
}

}  // namespace kelvo::x11
