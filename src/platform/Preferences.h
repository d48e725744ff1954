#pragma once

#include "base/Value.h"

#include <string_view>

namespace kelvo {

/// The domain of the daemon's own preferences.
inline constexpr std::string_view kPreferencesDomain = "com.quillon.kelvod";

/// The user's and the administrator's settings, by domain and key. Implemented by the Linux adapter (one JSON
/// file a domain) and the simulated device. Any thread.
class Preferences {
  public:
    virtual ~Preferences() = default;

    /// The value now under `key`: a change from outside is seen at the next read. Nothing when there is no
    /// value, or when the domain cannot be read (which is logged).
    virtual Value value(std::string_view key, std::string_view domain) = 0;
};

}  // namespace kelvo
