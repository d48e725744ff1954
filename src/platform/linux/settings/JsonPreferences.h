#pragma once

#include "platform/Preferences.h"
#include "platform/linux/files/DeviceRoot.h"

#include <memory>

namespace kelvo {

/// Preferences in "/private/var/mobile/Library/Preferences/DOMAIN.json" under the device root: one JSON
/// object of keys and values. The file is read at each query, so an edit counts at once. Thread-safe.
class JsonPreferences : public Preferences {
  public:
    explicit JsonPreferences(std::shared_ptr<const DeviceRoot> root) : root_(std::move(root)) {}

    Value value(std::string_view key, std::string_view domain) override;

  private:
    std::shared_ptr<const DeviceRoot> root_;
};

}  // namespace kelvo
