#pragma once

#include "base/Guarded.h"
#include "platform/AnalyticsSink.h"
#include "platform/simulated/SimulatedFaults.h"

#include <memory>
#include <vector>

namespace kelvo {

/// Keeps the messages that it is sent. Fails when "AnalyticsSink.send" was ordered to. Thread-safe.
class SimulatedAnalytics : public AnalyticsSink {
  public:
    explicit SimulatedAnalytics(std::shared_ptr<SimulatedFaults> faults) : faults_(std::move(faults)) {}

    std::vector<AnalyticsMessage> messages() const { return messages_.copy(); }

    OptionalError send(const AnalyticsMessage& message) override {
        if (auto error = faults_->take("AnalyticsSink.send")) return error;
        messages_.with([&](auto& messages) { messages.push_back(message); });
        return std::nullopt;
    }

  private:
    const std::shared_ptr<SimulatedFaults> faults_;
    Guarded<std::vector<AnalyticsMessage>> messages_;
};

}  // namespace kelvo
