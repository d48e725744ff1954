#pragma once

#include "base/Guarded.h"
#include "support/KVTemporaryFileStore.h"

#include <cstdint>
#include <map>
#include <memory>
#include <set>
#include <string>

namespace kelvo {

/// Which finished movies of the store somebody is about to save or throw away, so that nobody else does.
/// Thread-safe.
class MoviesInUse {
  public:
    /// Ends the use when its last copy goes. None for a movie outside of the store.
    using Hold = std::shared_ptr<void>;

    Hold hold(const URL& movieURL) {
        const auto name = KVTemporaryFileStore::nameInStore(movieURL);
        if (!name) return nullptr;
        const auto use = names_->with([&](Names& names) { return names.insert(*name); });
        return {nullptr,
                [names = names_, use](void*) { names->with([&](Names& held) { held.erase(use); }); }};
    }

    bool contains(const std::string& name) const {
        return names_->with([&](const Names& names) { return names.contains(name); });
    }

    // A movie that a client was handed is in its use until it asks for what becomes of it, or goes.
    void clientCame(std::int32_t process) {
        clients_.with([&](Clients& clients) { clients.try_emplace(process); });
    }
    void clientWent(std::int32_t process) {
        clients_.with([&](Clients& clients) { return clients.extract(process); });
    }
    /// One at a time. Nothing happens when the client has gone meanwhile.
    void handTo(std::int32_t process, const URL& movieURL) { give(process, hold(movieURL)); }
    void takeFrom(std::int32_t process) { give(process, nullptr); }

  private:
    using Names = std::multiset<std::string>;
    using Clients = std::map<std::int32_t, Hold>;

    void give(std::int32_t process, Hold movie) {
        clients_.with([&](Clients& clients) {
            const auto client = clients.find(process);
            if (client != clients.end()) client->second.swap(movie);
        });
    }

    const std::shared_ptr<Guarded<Names>> names_ = std::make_shared<Guarded<Names>>();
    Guarded<Clients> clients_;
};

}  // namespace kelvo
