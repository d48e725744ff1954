#pragma once

#include "base/Guarded.h"
#include "base/KVError.h"

#include <deque>
#include <map>
#include <optional>
#include <string>

namespace kelvo {

/// The failures that a test has ordered: each fails one later call of one operation. An operation is named
/// "Service.operation", as in "FileSystem.removeItem". Thread-safe.
class SimulatedFaults {
  public:
    void failNext(const std::string& operation, KVError error) {
        waiting_.with([&](auto& waiting) { waiting[operation].push_back(std::move(error)); });
    }

    /// The failure that this call of `operation` must report, if one was ordered.
    OptionalError take(const std::string& operation) {
        return waiting_.with([&](auto& waiting) -> OptionalError {
            const auto entry = waiting.find(operation);
            if (entry == waiting.end()) return std::nullopt;
            KVError error = std::move(entry->second.front());
            entry->second.pop_front();
            if (entry->second.empty()) waiting.erase(entry);
            return error;
        });
    }

  private:
    Guarded<std::map<std::string, std::deque<KVError>>> waiting_;
};

}  // namespace kelvo
