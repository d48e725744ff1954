#pragma once

#include "base/KVError.h"

#include <cstdint>
#include <string>

namespace kelvo {

/// One message for the analytics service: who reports, and what.
struct AnalyticsMessage {
    std::int32_t clientType = 0;
    std::int32_t clientVersion = 0;
    std::int64_t sessionIdentifier = 0;
    bool isBatchEvent = false;
    bool isUserInfoRequired = false;
    std::string clientName;
    std::string serviceName;
    std::int32_t category = 0;
    std::int32_t type = 0;
    Dictionary payload;
};

/// The analytics reporting service. Implemented by a Linux adapter that keeps what it is sent in a file
/// of the device, and by the simulated device, which records it. Any thread.
class AnalyticsSink {
  public:
    virtual ~AnalyticsSink() = default;

    /// Takes one message without waiting for its delivery; an error when it cannot be taken.
    virtual OptionalError send(const AnalyticsMessage& message) = 0;
};

}  // namespace kelvo
