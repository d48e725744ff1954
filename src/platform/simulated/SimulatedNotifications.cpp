#include "platform/simulated/SimulatedNotifications.h"

#include <algorithm>
#include <utility>

namespace kelvo {

NotificationToken SimulatedNotifications::registerForNotification(std::string_view name,
                                                                  QueuePriority priority, Handler handler) {
    return center_.with([&](Center& center) {
        center.registrations[++center.lastToken] = {std::string(name), priority, std::move(handler)};
        return center.lastToken;
    });
}

std::uint64_t SimulatedNotifications::state(NotificationToken token) {
    return center_.with([&](Center& center) -> std::uint64_t {
        const auto registration = center.registrations.find(token);
        if (registration == center.registrations.end()) return 0;
        const auto state = center.states.find(registration->second.name);
        return state == center.states.end() ? 0 : state->second;
    });
}

void SimulatedNotifications::removeObservers(std::string_view name) {
    center_.with([&](Center& center) {
        std::erase_if(center.registrations, [&](const auto& entry) { return entry.second.name == name; });
        ++center.removals[std::string(name)];
    });
}

void SimulatedNotifications::post(std::string_view name, std::uint64_t state) {
    center_.with([&](Center& center) {
        center.states[std::string(name)] = state;
        for (const auto& [token, registration] : center.registrations) {
            if (registration.name != name) continue;
            GlobalQueue::get(registration.priority).async([handler = registration.handler, token = token] {
                handler(token);
            });
        }
    });
}

std::size_t SimulatedNotifications::observerCount(std::string_view name) const {
    return center_.with([&](const Center& center) {
        return static_cast<std::size_t>(std::ranges::count_if(
            center.registrations, [&](const auto& e) { return e.second.name == name; }));
    });
}

int SimulatedNotifications::removalCount(std::string_view name) const {
    return center_.with([&](const Center& center) {
        const auto entry = center.removals.find(name);
        return entry == center.removals.end() ? 0 : entry->second;
    });
}

}  // namespace kelvo
