#pragma once

#include "base/Guarded.h"
#include "platform/StoragePurgeService.h"

#include <map>
#include <optional>
#include <string>

namespace kelvo {

/// A purge service that asks when a test wants it to, on the test's thread. Thread-safe.
class SimulatedStoragePurge : public StoragePurgeService {
  public:
    void registerCallbacks(std::string_view name, StoragePurgeCallbacks callbacks) override {
        callbacks_.with([&](auto& all) { all[std::string(name)] = std::move(callbacks); });
    }

    /// What was registered under `name`; none when nothing was.
    std::optional<StoragePurgeCallbacks> callbacks(std::string_view name) const {
        return callbacks_.with([&](const auto& all) -> std::optional<StoragePurgeCallbacks> {
            const auto entry = all.find(std::string(name));
            if (entry == all.end()) return std::nullopt;
            return entry->second;
        });
    }

    /// Asks every holder to purge at `urgency`; returns the bytes that they freed.
    std::uint64_t purge(PurgeUrgency urgency) {
        std::uint64_t freed = 0;
        for (const auto& [name, callbacks] : callbacks_.copy())
            freed += callbacks.purge(urgency);
        return freed;
    }

  private:
    Guarded<std::map<std::string, StoragePurgeCallbacks>> callbacks_;
};

}  // namespace kelvo
