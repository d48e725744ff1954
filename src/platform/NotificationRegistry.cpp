#include "platform/NotificationRegistry.h"

#include <algorithm>
#include <utility>

namespace kelvo {

NotificationToken NotificationRegistry::add(std::string_view name, QueuePriority priority,
                                            NotificationCenter::Handler handler) {
    return content_->with([&](Content& content) {
        content.registrations[++content.lastToken] = {std::string(name), priority, std::move(handler)};
        return content.lastToken;
    });
}

std::uint64_t NotificationRegistry::state(NotificationToken token) const {
    return content_->with([&](const Content& content) -> std::uint64_t {
        const auto registration = content.registrations.find(token);
        if (registration == content.registrations.end()) return 0;
        const auto state = content.states.find(registration->second.name);
        return state == content.states.end() ? 0 : state->second;
    });
}

void NotificationRegistry::remove(std::string_view name) {
    content_->with([&](Content& content) {
        std::erase_if(content.registrations, [&](const auto& entry) { return entry.second.name == name; });
    });
}

void NotificationRegistry::post(std::string_view name, std::uint64_t state) {
    content_->with([&](Content& content) {
        content.states[std::string(name)] = state;
        for (const auto& [token, registration] : content.registrations) {
            if (registration.name != name) continue;
            GlobalQueue::get(registration.priority).async([shared = content_, token = token] {
                run(*shared, token);
            });
        }
    });
}

void NotificationRegistry::run(const Guarded<Content>& content, NotificationToken token) {
    const auto handler = content.with([&](const Content& now) -> NotificationCenter::Handler {
        const auto registration = now.registrations.find(token);
        return registration == now.registrations.end() ? nullptr : registration->second.handler;
    });
    if (handler) handler(token);
}

std::size_t NotificationRegistry::count(std::string_view name) const {
    return content_->with([&](const Content& content) {
        return static_cast<std::size_t>(std::ranges::count_if(
            content.registrations, [&](const auto& entry) { return entry.second.name == name; }));
    });
}

}  // namespace kelvo
