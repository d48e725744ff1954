#pragma once

#include "base/Clock.h"
#include "platform/AnalyticsSink.h"

#include <cstdint>
#include <memory>
#include <string>

namespace kelvo {

/// Keeps what is reported in a file of the device, one line of JSON a message; nothing leaves the device.
/// `send` never waits for the disk: lines are written in the background, and at the latest when this object
/// goes. What cannot be written is dropped, with a line in the log. Thread-safe.
class AnalyticsLog : public AnalyticsSink {
  public:
    static constexpr std::uint64_t kMostBytes = 1U << 20;
    static constexpr std::size_t kMostWaiting = 256;

    /// Where the lines are, as a path of the device.
    static constexpr const char* kPath = "/private/var/mobile/Library/Logs/kelvod/analytics.jsonl";

    explicit AnalyticsLog(std::string hostPath, std::shared_ptr<Clock> clock,
                          std::uint64_t mostBytes = kMostBytes);
    ~AnalyticsLog() override;

    /// Fails with EAGAIN while `kMostWaiting` lines wait for the disk.
    OptionalError send(const AnalyticsMessage& message) override;

  private:
    class Writer;
    const std::shared_ptr<Clock> clock_;
    const std::shared_ptr<Writer> writer_;
};

}  // namespace kelvo
