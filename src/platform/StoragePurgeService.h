#pragma once

#include <cstdint>
#include <functional>
#include <string_view>

namespace kelvo {

/// How badly disk space is wanted back: 1 soon low, 2 low, 3 nearly full.
using PurgeUrgency = int;

/// What a holder of purgeable files offers. All four are called on the service's own thread, one at a time.
struct StoragePurgeCallbacks {
    /// Bytes that could be freed.
    std::function<std::int64_t(PurgeUrgency)> purgeableSpace;
    /// Frees space and returns the bytes freed.
    std::function<std::uint64_t(PurgeUrgency)> purge;
    /// The purge that was asked for is no longer needed; hands its argument back.
    std::function<std::uint64_t(std::uint64_t)> cancel;
    /// Regular housekeeping; returns the bytes freed.
    std::function<std::uint64_t()> periodic;
};

/// Asks for disk space back when the volume fills up. Implemented by the Linux adapter (a watcher of the
/// store's volume) and the simulated device.
class StoragePurgeService {
  public:
    virtual ~StoragePurgeService() = default;

    /// Registers the callbacks under `name`; a later registration of the same name replaces it. No callback
    /// runs once the service is destroyed.
    virtual void registerCallbacks(std::string_view name, StoragePurgeCallbacks callbacks) = 0;
};

}  // namespace kelvo
